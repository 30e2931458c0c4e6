// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/series/series.h"

#include <algorithm>
#include <cmath>
#include <numeric>

#include "snapshot/header.h"
#include "snapshot/word.h"

namespace kspdump {

void Series::begin(const Capture& capture) {
  isSnapshot_ = capture.kind == Kind::kSnapshot;
  captures_.push_back(capture);
  copies_.emplace_back();
  cells_.emplace_back();
  for (auto& [key, repeats] : repeats_) repeats.seen = 0;
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
    std::vector<Values>& cells = cells_.back();
    if (cells.size() <= track) cells.resize(tracks_.size());
    cells[track] = record.values;
  }
}

void Series::end(const Capture& capture) {
  captures_.back() = capture;
  if (isSnapshot_) return putInTime(capture);
  captures_.back().bytes = {};
  // What is shown of the capture stays when its bytes go.
  size_t size = 0;
  for (const Values& values : cells_.back()) size += values.copiedSize();
  copies_.back() = std::make_unique_for_overwrite<unsigned char[]>(size);
  unsigned char* at = copies_.back().get();
  for (Values& values : cells_.back()) values = values.copiedTo(at);
  cells_.back().shrink_to_fit();
}

void Series::putInTime(const Capture& capture) {
  // The timestamp is the first word of the fixed layout, and the key of a header's; shown or not.
  const auto key = capture.header.empty() ? 0 : ksp::SnapshotHeader(capture.header.data()).keyOffset();
  if (!key) return;
  const auto timeOf = [&](const Interval& interval) {
    return ksp::loadWord(capture.bytes.data() + interval.offset + *key);
  };
  std::erase_if(intervals_, [&](const Interval& interval) { return timeOf(interval) == 0; });
  const auto isEarlier = [&](const Interval& a, const Interval& b) { return timeOf(a) < timeOf(b); };
  // A ring of records has its oldest one behind its newest.
  const auto oldest = std::is_sorted_until(intervals_.begin(), intervals_.end(), isEarlier);
  if (std::is_sorted(oldest, intervals_.end(), isEarlier))
    std::rotate(intervals_.begin(), oldest, intervals_.end());
}

void Series::goOver(const Over& over, const std::vector<Capture>& leftOut) {
  std::vector<size_t> order(captures_.size());
  std::iota(order.begin(), order.end(), size_t{0});
  std::stable_sort(order.begin(), order.end(),
                   [&](size_t a, size_t b) { return over.values[a] < over.values[b]; });
  Series sorted;
  over_ = Over{over.name, {}};
  for (const size_t point : order) {
    over_->values.push_back(over.values[point]);
    sorted.captures_.push_back(std::move(captures_[point]));
    sorted.copies_.push_back(std::move(copies_[point]));
    sorted.cells_.push_back(std::move(cells_[point]));
  }
  captures_ = std::move(sorted.captures_);
  captures_.insert(captures_.end(), leftOut.begin(), leftOut.end());
  copies_ = std::move(sorted.copies_);
  cells_ = std::move(sorted.cells_);
}

void Series::addInterval(const Record& record) {
  if (intervals_.empty() || intervals_.back().number != record.key) {
    intervals_.push_back({record.offset, record.key});
  }
  if (intervals_.size() > 1) return;
  fieldsOffset_ = record.offset;
  tracks_.push_back({static_cast<uint32_t>(tracks_.size()), std::string(record.name), record.isArray,
                     record.values.size()});
  fields_.push_back(record.values);
}

size_t Series::trackOf(const Record& record) {
  Repeats& repeats = repeats_[record.key];
  if (repeats.seen == repeats.tracks.size()) {
    repeats.tracks.push_back(tracks_.size());
    tracks_.push_back({record.key, std::string(record.name), false, 0});
  }
  return repeats.tracks[repeats.seen++];
}

std::vector<size_t> Series::tracksInOrder() const {
  std::vector<size_t> order;
  for (size_t track = 0; track < tracks_.size(); ++track) {
    if (isSnapshot_ || ranking_.withUnchanged || changes(track)) order.push_back(track);
  }
  const auto sortBy = [&](auto isBefore) { std::stable_sort(order.begin(), order.end(), isBefore); };
  sortBy([&](size_t a, size_t b) { return tracks_[a].key < tracks_[b].key; });
  if (ranking_.order == Ranking::Order::kName) {
    sortBy([&](size_t a, size_t b) { return tracks_[a].name < tracks_[b].name; });
  } else if (ranking_.order == Ranking::Order::kChange) {
    std::vector<Wide> changes(tracks_.size());
    for (const size_t track : order) changes[track] = change(track).value_or(Wide()).magnitude();
    sortBy([&](size_t a, size_t b) { return changes[a] > changes[b]; });
  } else if (ranking_.order == Ranking::Order::kPercent) {
    std::vector<double> percents(tracks_.size());
    for (const size_t track : order) percents[track] = std::abs(percent(track).value_or(-0.0));
    sortBy([&](size_t a, size_t b) { return percents[a] > percents[b]; });
  }
  if (ranking_.most != 0 && order.size() > ranking_.most) order.resize(ranking_.most);
  return order;
}

Values Series::values(size_t track, size_t point) const {
  if (isSnapshot_) {
    return fields_[track].movedBy(static_cast<std::ptrdiff_t>(intervals_[point].offset) -
                                  static_cast<std::ptrdiff_t>(fieldsOffset_));
  }
  return track < cells_[point].size() ? cells_[point][track] : Values();
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

std::vector<std::optional<Wide>> Series::sums(size_t track) const {
  std::vector<std::optional<Wide>> sums;
  for (size_t point = 0; point < points(); ++point) sums.push_back(sum(track, point));
  return sums;
}

std::optional<Wide> Series::delta(size_t track, uint32_t element) const {
  return changeOf(value(track, 0, element), value(track, points() - 1, element));
}

std::optional<Wide> Series::change(size_t track) const {
  return changeOf(sum(track, 0), sum(track, points() - 1));
}

std::optional<double> Series::percent(size_t track) const {
  return percentOf(sum(track, 0), sum(track, points() - 1));
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

std::optional<double> Over::perUnit(const std::optional<Wide>& change) const {
  const uint64_t units = values.back() - values.front();
  if (!change || units == 0) return std::nullopt;
  return static_cast<double>(*change) / static_cast<double>(units);
}

Wide sum(const Values& values) {
  Wide sum;
  for (uint32_t i = 0; i < values.size(); ++i) sum += values[i];
  return sum;
}

}  // namespace kspdump
