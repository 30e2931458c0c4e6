#pragma once

#include <algorithm>
#include <cstdint>
#include <ostream>
#include <string>
#include <string_view>
#include <vector>

#include "ksp/entries.hpp"

/// Streams record by record, and contexts as values to compare.
namespace ksp::test {

class Stream {
 public:
  Stream& bytes(uint64_t number, unsigned count) {
    for (unsigned i = 0; i < count; ++i, number >>= 8) bytes_.push_back(static_cast<unsigned char>(number));
    return *this;
  }

  Stream& stat(uint32_t key, const std::vector<uint64_t>& values) {
    return header(key, static_cast<uint32_t>(values.size())).words(values);
  }
  Stream& header(uint32_t key, uint32_t count) { return bytes(key, 4).bytes(count, 4); }
  Stream& words(const std::vector<uint64_t>& values) {
    for (const uint64_t value : values) bytes(value, 8);
    return *this;
  }

  /// A media record of `length` bytes, whose elements of `width` bytes are 1, 2, 3 and so on.
  Stream& media(uint16_t key, uint16_t length, unsigned width = 4) {
    bytes(key, 2).bytes(length, 2);
    for (unsigned i = 0; i < length; i += width) bytes(i / width + 1, std::min(width, length - i));
    return *this;
  }

  /// Hands the stream to `parse` from an odd address, with nothing behind its last byte.
  template <class Parse, class Context>
  auto run(Parse parse, Context* context) const {
    std::vector<unsigned char> odd(1);
    odd.insert(odd.end(), bytes_.begin(), bytes_.end());
    return parse(context, odd.data() + 1, static_cast<uint32_t>(bytes_.size()));
  }

 private:
  std::vector<unsigned char> bytes_;
};

struct NamedValue {
  std::string name;
  uint64_t value;

  bool operator==(const NamedValue&) const = default;
  friend std::ostream& operator<<(std::ostream& out, const NamedValue& entry) {
    return out << entry.name << '=' << entry.value;
  }
};
using Entries = std::vector<NamedValue>;

template <class Context>
Entries entriesOf(const Context& context) {
  Entries found;
  for (auto [name, value] : entries(context)) found.push_back({std::string(name), value});
  return found;
}

/// Values 1, 2, 3 and so on under `stem` and their index.
inline Entries numbered(const std::string& stem, unsigned count) {
  Entries expected;
  for (unsigned i = 0; i < count; ++i) expected.push_back({stem + std::to_string(i), i + 1});
  return expected;
}

inline Entries operator+(Entries one, const Entries& other) {
  one.insert(one.end(), other.begin(), other.end());
  return one;
}

inline std::vector<uint64_t> countUp(unsigned count) {
  std::vector<uint64_t> values;
  for (uint64_t i = 1; i <= count; ++i) values.push_back(i);
  return values;
}

}  // namespace ksp::test
