#pragma once

#include <optional>
#include <span>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "tools/kspdump/capture.h"

namespace kspdump {

enum class Format { kTable, kJson, kCsv, kOpenMetrics };

/// First line of CSV output.
inline constexpr std::string_view kCsvHead = "source,kind,key,name,element,value\n";

/// Renders one capture to a text: parts of it as it is decoded, where the format allows that, then the rest.
class CaptureRenderer {
 public:
  /// A table is `width` columns wide where names allow.
  CaptureRenderer(Format format, size_t width, std::string& out)
      : format_(format), width_(width), out_(out) {}

  /// Renders the records decoded so far and takes them from the capture.
  void part(Capture& capture);

  /// Renders what is left. The records of a table, and for OpenMetrics those of every capture, stay in it.
  void end(Capture& capture);

 private:
  Format format_;
  size_t width_;
  std::string& out_;
  bool isBegun_ = false;
  bool hasRecords_ = false;
};

/// Appends a capture's findings as the JSON member `member`.
void renderJsonFindings(std::string& out, std::string_view member, const Capture& capture);

/// Appends a picture of `values`, at most `width` characters, scaled to the largest.
void renderBars(std::string& out, const std::vector<Wide>& values, size_t width);

/// Gathers records into one OpenMetrics exposition, in which every metric stands once.
class OpenMetrics {
 public:
  /// Adds a capture's records; one that comes again becomes a finding of the capture.
  void add(Capture& capture);

  /// Adds a record's values, without those that are missing, to the metric of its name and `suffix`. Returns
  /// false when the source had a record of this name and key already; the new one takes its place.
  bool add(Kind kind, const Record& record, std::string_view suffix, const std::string& source,
           std::span<const std::optional<Wide>> values);

  std::string text() const;

 private:
  struct Sample {
    size_t source;
    uint32_t key;
    bool isElement;
    uint32_t element;
    Wide value;
  };
  struct Metric {
    std::string name;
    std::string help;
    std::vector<Sample> samples;
    std::unordered_set<uint64_t> seen;
  };

  std::vector<Metric> metrics_;
  std::unordered_map<std::string, size_t> metricsByName_;
  std::vector<std::string> sources_;
  std::unordered_map<std::string, size_t> sourcesByName_;
};

/// The fewest columns that a table's pictures have.
inline constexpr size_t kLeastBars = 8;

}  // namespace kspdump
