// kspdump's decoders and renderers: the first byte chooses the kind, and whether a snapshot has a header,
// which the rest then begins with. JSON must be JSON and hold every value.

#include <cstdlib>
#include <nlohmann/json.hpp>

#include "tools/kspdump/decode.h"
#include "tools/kspdump/diff.h"
#include "tools/kspdump/render.h"
#include "tools/kspdump/snapshot.h"

using namespace kspdump;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  const std::span input(data + 1, size - 1);
  Decoding decoding = {.kind = static_cast<Kind>(data[0] % 4), .byNumber = (data[0] & 4) != 0};
  std::span<const uint8_t> bytes = input;
  if (decoding.kind == Kind::kSnapshot && (data[0] & 8) != 0) {
    const size_t headerSize = std::min<size_t>(data[0] & 0xF0, input.size());
    if (headerFault(input.first(headerSize)) != nullptr) return 0;
    decoding.header = input.first(headerSize);
    bytes = input.subspan(headerSize);
  }
  Capture capture;
  const auto rendered = [&](Format format) {
    std::string text;
    CaptureRenderer renderer(format, 80, text);
    decode(bytes, "input", decoding, capture);
    renderer.end(capture);
    return text;
  };
  const auto document = nlohmann::json::parse(rendered(Format::kJson));
  rendered(Format::kCsv);
  if (rendered(Format::kTable).empty()) std::abort();
  size_t values = 0;
  for (const auto& record : document["records"]) values += record["values"].size();
  if (values != capture.values.size()) std::abort();
  if (decoding.kind == Kind::kSnapshot) {
    size_t written = 0;
    reportSnapshot(capture, bytes, decoding.header, [&](std::string_view page) { written += page.size(); });
    if (decoding.header.empty() && written < 1338) std::abort();
  }
  OpenMetrics metrics;
  metrics.add(capture);
  if (!metrics.text().ends_with("# EOF\n")) std::abort();
  if (!renderDiff(capture, capture, Format::kTable, 80).ends_with(": 0 changed\n")) std::abort();
  return 0;
}
