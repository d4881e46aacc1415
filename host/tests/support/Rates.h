#pragma once

#include "common/FrameRate.h"

/// The frame rate that `text` names as an option does: "59.94".
inline receiver::FrameRate Rate(const char* text) {
    return receiver::ParseFrameRate(text).value();
}
