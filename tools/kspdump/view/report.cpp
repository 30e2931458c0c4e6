// SPDX-License-Identifier: Apache-2.0
// The controller's own text report of a snapshot.

#include <algorithm>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "ksp/snapshot.h"
#include "snapshot/header.h"
#include "snapshot/legend.h"
#include "snapshot/record_layout.h"
#include "tools/kspdump/view/forms.h"
#include "tools/kspdump/view/text.h"

namespace kspdump {

namespace {

class Report : public View {
 public:
  using View::View;

  void begin(Capture& /*capture*/) override {}
  void records(std::span<const Record> /*records*/) override {}

  void end(Capture& capture) override {
    if (capture.header.empty()) {
      addFixed(capture.bytes);
    } else {
      addPages(capture);
    }
  }

  [[nodiscard]] bool showsFindings() const override { return false; }

 private:
  void addFixed(Bytes records) {
    constexpr auto kRecord = static_cast<size_t>(ksp::kRecordBytes);
    constexpr size_t kChunk = 4096 * kRecord;
    constexpr size_t kLongestLine = 1024;
    const size_t usable = records.size() / kRecord * kRecord;
    std::vector<char> text(ksp::kLegend.size() + std::min(kChunk, usable) / kRecord * kLongestLine + 2);
    size_t done = 0;
    do {
      const size_t chunk = std::min(kChunk, usable - done);
      uint64_t size = text.size();
      KSPParseSnapshotBuffer(records.data() + done, chunk, text.data(), &size);
      std::string_view part(text.data(), static_cast<size_t>(size));
      // The legend goes before the first record and the empty line behind the last.
      if (done != 0) part.remove_prefix(ksp::kLegend.size());
      done += chunk;
      if (done < usable) part.remove_suffix(1);
      sink_.text += part;
      sink_.offer();
    } while (done < usable);
  }

  void addPages(Capture& capture) {
    // Room that is not written to takes no memory.
    constexpr size_t kPage = size_t{1} << 22;
    const auto page = std::make_unique_for_overwrite<char[]>(kPage);
    uint32_t cursor = 0;
    for (int done = 0; done == 0;) {
      uint64_t size = kPage;
      done = KSPParseSnapshotBufferWithInplaceParser(capture.bytes.data(), capture.bytes.size(), page.get(),
                                                     &size, capture.header.data(), &cursor);
      const bool isEmpty = size == 1;
      addLines({page.get(), static_cast<size_t>(size) - 1});
      if (done != 0) break;
      // The line that did not fit opens the next page, unless it had this to itself.
      if (!isEmpty) {
        --cursor;
      } else {
        const uint32_t lost = std::max(cursor, 1U) - 1;
        capture.find(ksp::SnapshotHeader(capture.header.data()).recordOffset(lost),
                     "the line of record " + std::to_string(lost) + " is too long and left out");
        cursor = lost + 1;
      }
    }
  }

  /// The header's title and formats come from the device, so nothing but lines is let through of them.
  void addLines(std::string_view text) {
    for (size_t end = text.find('\n'); end != std::string_view::npos; end = text.find('\n')) {
      sink_.text += printable(text.substr(0, end));
      endLine();
      text.remove_prefix(end + 1);
    }
  }
};

}  // namespace

std::unique_ptr<View> makeReport(const ViewOptions& /*options*/, Sink& sink) {
  return std::make_unique<Report>(sink);
}

}  // namespace kspdump
