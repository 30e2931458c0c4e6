#include "tools/kspdump/series/series.h"

#include <algorithm>
#include <numeric>

namespace kspdump {

void Series::begin(const Capture& capture) {
  isSnapshot_ = capture.kind == Kind::kSnapshot;
  captures_.push_back(capture);
  copies_.emplace_back();
  cells_.emplace_back();
  seen_.clear();
}

void Series::records(std::span<const Record> records) {
  for (const Record& record : records) {
    if (isSnapshot_) {
      addInterval(record);
      continue;
    }
    const size_t track = trackOf(record);
    tracks_[track].isArray |= record.isArray;
    tracks_[track].elements = std::max(tracks_[track].elements, record.values.size());
    std::vector<Cell>& cells = cells_.back();
    if (cells.size() <= track) cells.resize(std::max(track + 1, tracks_.size()));
    std::vector<unsigned char>& copy = copies_.back();
    cells[track] = {copy.size(), record.values.size(), record.values.width()};
    record.values.copyTo(copy);
  }
}

void Series::end(const Capture& capture) {
  captures_.back() = capture;
  if (isSnapshot_) return;
  captures_.back().bytes = {};
  copies_.back().shrink_to_fit();
}

void Series::addInterval(const Record& record) {
  if (intervals_.empty() || intervals_.back().number != record.key) {
    intervals_.push_back({record.offset, record.key});
  }
  if (intervals_.size() > 1) return;
  tracks_.push_back({static_cast<uint32_t>(tracks_.size()), std::string(record.name), record.isArray,
                     record.values.size()});
  fields_.push_back(record.values);
}

size_t Series::trackOf(const Record& record) {
  const auto [at, isNew] = trackOfKey_.try_emplace({record.key, seen_[record.key]++}, tracks_.size());
  if (isNew) tracks_.push_back({record.key, std::string(record.name), false, 0});
  return at->second;
}

std::vector<size_t> Series::tracksInOrder() const {
  std::vector<size_t> order(tracks_.size());
  std::iota(order.begin(), order.end(), size_t{0});
  std::stable_sort(order.begin(), order.end(),
                   [&](size_t a, size_t b) { return tracks_[a].key < tracks_[b].key; });
  return order;
}

Values Series::values(size_t track, size_t point) const {
  if (isSnapshot_) {
    return fields_[track].movedBy(static_cast<std::ptrdiff_t>(intervals_[point].offset) -
                                  static_cast<std::ptrdiff_t>(intervals_.front().offset));
  }
  if (track >= cells_[point].size()) return {};
  const Cell& cell = cells_[point][track];
  return {copies_[point].data() + cell.first, cell.count, cell.width, cell.width};
}

std::optional<uint64_t> Series::value(size_t track, size_t point, uint32_t element) const {
  const Values at = values(track, point);
  if (element >= at.size()) return std::nullopt;
  return at[element];
}

std::optional<Wide> Series::sum(size_t track, size_t point) const {
  const Values at = values(track, point);
  if (at.empty()) return std::nullopt;
  return kspdump::sum(at);
}

std::optional<Wide> Series::delta(size_t track, uint32_t element) const {
  const auto first = value(track, 0, element);
  const auto last = value(track, points() - 1, element);
  if (!first || !last) return std::nullopt;
  return Wide(*last) - Wide(*first);
}

bool Series::changes(size_t track) const {
  const Values first = values(track, 0);
  for (size_t point = 1; point < points(); ++point) {
    const Values here = values(track, point);
    if (here.size() != first.size()) return true;
    for (uint32_t i = 0; i < here.size(); ++i) {
      if (here[i] != first[i]) return true;
    }
  }
  return false;
}

Wide sum(const Values& values) {
  Wide sum;
  for (uint32_t i = 0; i < values.size(); ++i) sum += values[i];
  return sum;
}

}  // namespace kspdump
