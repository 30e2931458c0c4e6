// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string_view>

namespace host {

/// What keeps a text from the parser: its line, from 1, and the fault.
struct Objection {
  unsigned line = 0;
  std::string_view fault;
};

/// Looks for what the TOML parser must not see: nesting of more than eight levels, in brackets or in the
/// parts of one dotted key, as it calls itself for each; and, as its tables of white space beyond ASCII have
/// holes, such characters outside of comments, and texts over many lines. No host file needs any of it.
///
/// Reads no more of the language than quotes, comments, brackets and dots; any bytes are safe.
std::optional<Objection> objectionTo(std::string_view text);

}  // namespace host
