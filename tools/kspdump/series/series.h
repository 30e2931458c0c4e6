// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <unordered_map>
#include <vector>

#include "tools/kspdump/decode/capture.h"
#include "tools/kspdump/series/course.h"
#include "tools/kspdump/series/ranking.h"
#include "tools/kspdump/series/wide.h"

namespace kspdump {

/// A statistic, or a field of a snapshot, over the points of a series.
struct Track {
  /// Of a snapshot's field, its place.
  uint32_t key;
  std::string name;
  /// An array at one point at least.
  bool isArray;
  /// The most that it has at a point.
  uint32_t elements;
};

/// Points in a row, each a set of named values: captures in the order given, or the intervals of a snapshot.
///
/// It is filled as a view is: `begin`, `records`, `end` for each capture. The k-th record of a key belongs to
/// the k-th of that key at the other points. The values of captures are copied; those of a snapshot's
/// intervals stay where they are, so the bytes of its capture outlive the series.
class Series {
 public:
  void begin(const Capture& capture);
  void records(std::span<const Record> records);
  void end(const Capture& capture);

  /// Says which tracks are shown.
  void rank(const Ranking& ranking) { ranking_ = ranking; }
  [[nodiscard]] bool showsUnchanged() const { return ranking_.withUnchanged; }
  /// Puts captures in ascending order of a statistic, `over.values` being those in the order given. Captures
  /// without it are no points.
  void goOver(const Over& over, const std::vector<Capture>& leftOut);
  /// Null where the series goes in the order given.
  [[nodiscard]] const Over* over() const { return over_ ? &*over_ : nullptr; }

  [[nodiscard]] Kind kind() const { return captures_.front().kind; }
  /// What was read, with its findings: a capture a point, behind them those left out; or, of a snapshot, one
  /// for all points.
  [[nodiscard]] const std::vector<Capture>& captures() const { return captures_; }

  [[nodiscard]] size_t points() const { return isSnapshot_ ? intervals_.size() : cells_.size(); }
  /// The number that a snapshot's record has at a point.
  [[nodiscard]] uint32_t recordNumber(size_t point) const { return intervals_[point].number; }

  /// In the order in which they came first.
  [[nodiscard]] const std::vector<Track>& tracks() const { return tracks_; }
  /// The tracks to show, as they were ranked; in ascending order of keys those that change where they were
  /// not.
  [[nodiscard]] std::vector<size_t> tracksInOrder() const;

  /// The values of a track at a point; empty where it has none.
  [[nodiscard]] Values values(size_t track, size_t point) const;
  /// One of these; none where the track has none there.
  [[nodiscard]] std::optional<uint64_t> value(size_t track, size_t point, uint32_t element) const;
  /// Of all elements; none where the track has no value there.
  [[nodiscard]] std::optional<Wide> sum(size_t track, size_t point) const;
  /// That at each point.
  [[nodiscard]] std::vector<std::optional<Wide>> sums(size_t track) const;
  /// What an element grew by from the first point to the last; none where it is missing at one.
  [[nodiscard]] std::optional<Wide> delta(size_t track, uint32_t element) const;
  /// What the sum grew by from the first point to the last; none where it is missing at one.
  [[nodiscard]] std::optional<Wide> change(size_t track) const;
  /// That in percent of the first; none where that is 0.
  [[nodiscard]] std::optional<double> percent(size_t track) const;
  /// Whether a track has not the same values at all points.
  [[nodiscard]] bool changes(size_t track) const;

 private:
  /// The tracks that a key has, one for each time that it came in one capture, and how often it came in this.
  struct Repeats {
    std::vector<size_t> tracks;
    size_t seen = 0;
  };
  struct Interval {
    uint64_t offset;
    uint32_t number;
  };

  void addInterval(const Record& record);
  size_t trackOf(const Record& record);

  void putInTime(const Capture& capture);

  bool isSnapshot_ = false;
  Ranking ranking_;
  std::optional<Over> over_;
  std::vector<Capture> captures_;
  std::vector<Track> tracks_;

  // Of captures, the values of each by track, and the copies of the bytes in which they lie.
  std::vector<std::vector<Values>> cells_;
  std::vector<std::unique_ptr<unsigned char[]>> copies_;
  std::unordered_map<uint32_t, Repeats> repeats_;

  // Of a snapshot, the fields of the first interval that was handed over; the others' lie at the same
  // distance.
  std::vector<Values> fields_;
  uint64_t fieldsOffset_ = 0;
  std::vector<Interval> intervals_;
};

/// The sum of a record's values.
Wide sum(const Values& values);

}  // namespace kspdump
