// SPDX-License-Identifier: Apache-2.0
// One exposition for monitoring systems: a metric family a kind, the controller's names as a label.

#include <algorithm>
#include <array>
#include <bitset>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "tools/kspdump/view/forms.h"
#include "tools/kspdump/view/text.h"

namespace kspdump {

namespace {

/// A label's value as UTF-8, what would end it escaped.
std::string escaped(std::string_view text) {
  std::string out;
  for (const char c : utf8(text)) {
    if (c == '\n') {
      out += "\\n";
      continue;
    }
    if (c == '\\' || c == '"') out += '\\';
    out += c;
  }
  return out;
}

/// Which record of a key is its last, by the records' places among all. Keys that come once, which most do,
/// take a bit each; a bit that two of them share makes none of them wrong.
class LastOfKeys {
 public:
  void clear() {
    for (auto& page : seen_) page.reset();
    entries_.clear();
    distinct_ = 0;
  }

  /// Places ascend.
  void add(uint32_t key, uint32_t place) {
    auto& page = seen_[key / kPageKeys % kPages];
    if (page == nullptr) page = std::make_unique<Page>();
    if (!page->test(key % kPageKeys)) {
      page->set(key % kPageKeys);
      return;
    }
    entries_.push_back(entry(key, place));
    if (entries_.size() >= std::max(kSmall, 2 * distinct_)) sort();
  }

  void sort() {
    std::sort(entries_.begin(), entries_.end());
    const auto isSameKey = [](uint64_t a, uint64_t b) { return a >> 32 == b >> 32; };
    // The last of each key is the first from behind.
    entries_.erase(entries_.begin(), std::unique(entries_.rbegin(), entries_.rend(), isSameKey).base());
    distinct_ = entries_.size();
  }

  /// Behind `sort`.
  [[nodiscard]] bool isLast(uint32_t key, uint32_t place) const {
    const auto at = std::lower_bound(entries_.begin(), entries_.end(), entry(key, 0));
    return at == entries_.end() || *at >> 32 != key || *at == entry(key, place);
  }

 private:
  static constexpr size_t kSmall = 4096;
  static constexpr size_t kPageKeys = 32768;
  static constexpr size_t kPages = 2048;
  using Page = std::bitset<kPageKeys>;

  static uint64_t entry(uint32_t key, uint32_t place) { return uint64_t{key} << 32 | place; }

  std::array<std::unique_ptr<Page>, kPages> seen_;
  std::vector<uint64_t> entries_;
  size_t distinct_ = 0;
};

class Metrics : public View {
 public:
  using View::View;

  void tail() override { sink_.text += "# EOF\n"; }

  [[nodiscard]] bool measures(const Capture& capture) const override {
    return capture.kind != Kind::kSnapshot;
  }

  void measure(std::span<const Record> records) override {
    for (const Record& record : records) last_.add(record.key, place_++);
  }

  void begin(Capture& capture) override {
    last_.sort();
    place_ = 0;
    repeated_.clear();
    furtherRepeated_ = 0;
    isSnapshot_ = capture.kind == Kind::kSnapshot;
    // The summary's fields are statistics of that name.
    const Kind family = capture.kind == Kind::kSummary ? Kind::kStats : capture.kind;
    front_.assign("ksp_").append(kindName(family)).append("{source=\"").append(escaped(capture.source));
    intervals_ = {};
    if (isSnapshot_) intervals_.begin(capture);
  }

  void records(std::span<const Record> records) override {
    if (isSnapshot_) return intervals_.records(records);
    for (const Record& record : records) {
      if (last_.isLast(record.key, place_++)) {
        add(record);
        sink_.offer();
      } else if (repeated_.size() == Capture::kMostFindings) {
        ++furtherRepeated_;
      } else {
        repeated_.push_back({record.offset, std::string(record.name) + "(" + std::to_string(record.key) +
                                                ") comes again; its last record stands"});
      }
    }
  }

  void end(Capture& capture) override {
    if (isSnapshot_) addNewest(capture);
    for (Finding& finding : repeated_) capture.find(finding.offset, std::move(finding.reason));
    capture.furtherFindings += furtherRepeated_;
    last_.clear();
    place_ = 0;
  }

  [[nodiscard]] bool showsFindings() const override { return false; }

 private:
  /// Of a snapshot the newest interval in use is shown.
  void addNewest(const Capture& capture) {
    intervals_.end(capture);
    const std::vector<Track>& tracks = intervals_.tracks();
    for (size_t track = 0; track < tracks.size() && intervals_.points() != 0; ++track) {
      const Values values = intervals_.values(track, intervals_.points() - 1);
      add({.offset = 0,
           .key = 0,
           .isArray = tracks[track].isArray,
           .isListed = false,
           .name = tracks[track].name,
           .values = values});
    }
  }

  void add(const Record& record) {
    Appender appender(sink_);
    for (uint32_t i = 0; i < record.values.size(); ++i) {
      appender.text(front_);
      if (!isSnapshot_) {
        appender.text("\",key=\"");
        appender.number(record.key);
      }
      appender.text("\",name=\"");
      appender.text(isSnapshot_ ? escaped(record.name) : record.name);
      if (record.isArray) {
        appender.text("\",element=\"");
        appender.number(i);
      }
      appender.text("\"} ");
      appender.number(record.values[i]);
      appender.text("\n");
    }
  }

  std::string front_;
  bool isSnapshot_ = false;
  LastOfKeys last_;
  uint32_t place_ = 0;
  std::vector<Finding> repeated_;
  uint64_t furtherRepeated_ = 0;
  Series intervals_;
};

}  // namespace

std::unique_ptr<View> makeMetrics(const ViewOptions& /*options*/, Sink& sink) {
  return std::make_unique<Metrics>(sink);
}

}  // namespace kspdump
