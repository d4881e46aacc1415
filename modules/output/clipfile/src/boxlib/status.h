// Propagation of statuses.
#pragma once

#include "boxlib/mbx_types.h"

// Returns from the calling function with the first status that is not MBX_OK.
#define MBX_TRY(expression)                                  \
    do {                                                     \
        const MbxStatus mbx_try_status = (expression);       \
        if (mbx_try_status != MBX_OK) return mbx_try_status; \
    } while (false)
