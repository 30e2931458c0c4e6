#include "tools/kspdump/view/bars.h"

#include <algorithm>
#include <iterator>

namespace kspdump {

const char* bar(size_t level) {
  static constexpr const char* kBlocks[] = {"·", "▁", "▂", "▃", "▄", "▅", "▆", "▇", "█"};
  static constexpr const char* kAscii[] = {"_", ".", ":", "-", "=", "+", "*", "#", "@"};
  return (localeIsUtf8() ? kBlocks : kAscii)[level];
}

void appendBar(std::string& out, uint64_t value, uint64_t largest, size_t width) {
  static constexpr const char* kParts[] = {"", "▏", "▎", "▍", "▌", "▋", "▊", "▉"};
  constexpr size_t kEighths = std::size(kParts);
  if (value == 0) return;
  const double columns =
      static_cast<double>(value) / static_cast<double>(largest) * static_cast<double>(width);
  // Whatever is there is seen.
  const auto eighths = std::max<size_t>(1, static_cast<size_t>(columns * kEighths));
  if (localeIsUtf8()) {
    for (size_t i = 0; i < eighths / kEighths; ++i) out += "█";
    out += kParts[eighths % kEighths];
  } else {
    out.append(std::max<size_t>(1, eighths / kEighths), '#');
  }
}

}  // namespace kspdump
