#pragma once

#include "foundation/core/text/utf.h"

namespace qf::zero {

// The framework's names for the UTF-8 / UTF-16 conversions of foundation (see there for how
// malformed input is treated); they live below core so that message rendering can use them.
using foundation::core::text::toUtf16;
using foundation::core::text::toUtf8;

}  // namespace qf::zero
