#pragma once

#include <map>
#include <string>
#include <unordered_map>
#include <vector>

#include "tools/kspdump/capture.h"

namespace kspdump {

enum class Format { kTable, kJson, kCsv, kOpenMetrics };

/// Appends a capture as a table for people, `width` columns wide where names allow.
void renderTable(std::string& out, const Capture& capture, size_t width);

/// Appends a capture as one line of JSON.
void renderJson(std::string& out, const Capture& capture);

/// First line of CSV output.
inline constexpr std::string_view kCsvHead = "source,kind,key,name,element,value\n";

/// Appends a capture as CSV rows, a value each.
void renderCsv(std::string& out, const Capture& capture);

/// Appends a capture's findings as the JSON member `member`.
void renderJsonFindings(std::string& out, std::string_view member, const Capture& capture);

/// Appends a picture of `values`, at most `width` characters, scaled to the largest.
void renderBars(std::string& out, const std::vector<Wide>& values, size_t width);

/// Gathers captures into one OpenMetrics exposition, in which every metric stands once.
class OpenMetrics {
 public:
  /// Adds a capture's values; a record that comes again becomes a finding of the capture.
  void add(Capture& capture);

  /// Adds one value of the metric of a statistic named `name`. `element` is -1 where there is one value
  /// alone. Returns false when the same value was there already; the new one stands.
  bool add(std::string_view kind, std::string_view name, std::string_view suffix, std::string_view source,
           uint32_t key, int64_t element, Wide value);

  std::string text() const;

 private:
  struct Metric {
    std::string name;
    std::string help;
    std::vector<std::pair<std::string, Wide>> samples;
    std::unordered_map<std::string, size_t> bySample;
  };

  std::vector<Metric> metrics_;
  std::map<std::string, size_t> byName_;
};

}  // namespace kspdump
