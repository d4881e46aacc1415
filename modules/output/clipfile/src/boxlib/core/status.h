// Propagation of statuses.
#pragma once

#include "boxlib/mbx_types.h"

// Returns from the calling function with the first status that is not MBX_OK.
#define MBX_TRY(expression)                                  \
    do {                                                     \
        const MbxStatus mbx_try_status = (expression);       \
        if (mbx_try_status != MBX_OK) return mbx_try_status; \
    } while (false)

// Whether any of the pointers is null: the check that opens most functions.
template <typename... Pointers>
constexpr bool MbxAnyNull(Pointers... pointers) {
    return (... || (pointers == nullptr));
}
