// SPDX-License-Identifier: Apache-2.0
// kspdump's decoders and views: the first byte chooses the kind, and whether a snapshot has a header, which
// the rest then begins with. JSON must be JSON and hold every value.

#include <cstdlib>
#include <nlohmann/json.hpp>

#include "tools/kspdump/decode/snapshot.h"
#include "tools/kspdump/view/view.h"

using namespace kspdump;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  const std::span input(data + 1, size - 1);
  Decoding decoding;
  decoding.kind = static_cast<Kind>(data[0] % 4);
  decoding.byNumber = (data[0] & 4) != 0;
  Bytes bytes = input;
  const bool isSnapshot = decoding.kind == Kind::kSnapshot;
  if (isSnapshot && (data[0] & 8) != 0) {
    const size_t headerSize = std::min<size_t>(data[0] & 0xF0, input.size());
    if (headerFault(input.first(headerSize)) != nullptr) return 0;
    decoding.header = input.first(headerSize);
    bytes = input.subspan(headerSize);
  }
  Capture capture;
  capture.source = "input";
  capture.bytes = bytes;
  static Batch batch;
  Series same;
  size_t values = 0;
  for (int twice = 0; twice < 2; ++twice) {
    values = 0;
    same.begin(capture);
    decode(decoding, capture, batch, [&](std::span<const Record> records) {
      same.records(records);
      for (const Record& record : records) values += record.values.size();
    });
    same.end(capture);
  }
  for (const Form* form : formsFor(isSnapshot ? Subject::kSnapshot : Subject::kStatistics)) {
    Sink sink;
    const auto view = form->make({.isSnapshot = isSnapshot}, sink);
    view->head();
    show(decoding, capture, batch, *view);
    view->tail();
    // The report of a snapshot without a record in use is empty.
    if (sink.text.empty() && form->name != "report") std::abort();
    if (form->name != "json") continue;
    size_t written = 0;
    const auto document = nlohmann::json::parse(sink.text);
    for (const auto& record : document["records"]) written += record["values"].size();
    if (values != written) std::abort();
  }
  if (isSnapshot) return 0;
  for (const Form* form : formsFor(Subject::kDifference)) {
    Sink sink;
    form->make({}, sink)->difference(same);
    if (form->name == "table" && sink.text.find(": 0 changed\n") == std::string::npos) std::abort();
  }
  for (const Form* form : formsFor(Subject::kTrend)) {
    Sink sink;
    form->make({}, sink)->trend(same);
    if (form->name == "json" && !nlohmann::json::parse(sink.text)["series"].empty()) std::abort();
  }
  return 0;
}
