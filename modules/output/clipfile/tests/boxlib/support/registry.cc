#include "boxlib/support/registry.h"

std::vector<BoxRow>& BoxRows() {
    static std::vector<BoxRow> rows;
    return rows;
}
