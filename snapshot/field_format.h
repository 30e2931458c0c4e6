// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>

#include "snapshot/header.h"

namespace ksp {

/// Tells whether the C library may print a field of `descriptor` with the descriptor's own format.
///
/// It may if the format ends within its bytes and asks for no more than such a field supplies: one unsigned
/// number, two for thousandths, or a string for triples. A conversion may have flags, a width and a
/// precision of at most three digits each, but no `*` and no length modifier.
bool formatIsSafe(const FieldDescriptor& descriptor);

}  // namespace ksp
