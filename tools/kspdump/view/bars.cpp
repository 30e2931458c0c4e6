#include "tools/kspdump/view/bars.h"

namespace kspdump {

const char* bar(size_t level) {
  static constexpr const char* kBlocks[] = {"·", "▁", "▂", "▃", "▄", "▅", "▆", "▇", "█"};
  static constexpr const char* kAscii[] = {"_", ".", ":", "-", "=", "+", "*", "#", "@"};
  return (localeIsUtf8() ? kBlocks : kAscii)[level];
}

}  // namespace kspdump
