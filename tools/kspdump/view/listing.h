// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <variant>
#include <vector>

namespace kspdump {

/// Rows of numbers and texts, all alike: what is known of keys, or of files.
struct Listing {
  struct Column {
    std::string name;
    /// Behind a number in a table.
    std::string unit;
  };
  using Cell = std::variant<uint64_t, std::string>;

  std::vector<Column> columns;
  std::vector<std::vector<Cell>> rows;
};

}  // namespace kspdump
