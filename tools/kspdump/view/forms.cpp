// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/view/forms.h"

#include <algorithm>
#include <iterator>

namespace kspdump {

namespace {

using enum Subject;

/// A subject's first form is the one it is shown in where none is asked for.
const Form kForms[] = {
    {"report", makeReport, {kSnapshot}},
    {"table", makeTable, {kStatistics, kSnapshot, kDifference, kTrend, kListing}},
    {"json", makeJson, {kStatistics, kSnapshot, kDifference, kTrend, kListing}},
    {"chart", makeChart, {kSnapshot, kTrend}},
    {"csv", makeCsv, {kStatistics, kSnapshot, kDifference, kTrend, kListing}},
    {"html", makeHtml, {kStatistics, kSnapshot, kDifference, kTrend}},
    {"openmetrics", makeMetrics, {kStatistics, kSnapshot}},
};

}  // namespace

std::vector<const Form*> formsFor(Subject subject) {
  std::vector<const Form*> forms;
  for (const Form& form : kForms) {
    if (std::find(form.shows.begin(), form.shows.end(), subject) != form.shows.end()) forms.push_back(&form);
  }
  return forms;
}

const Form* findForm(std::string_view name, Subject subject) {
  for (const Form* form : formsFor(subject)) {
    if (form->name == name) return form;
  }
  return nullptr;
}

void show(const Decoding& decoding, Capture& capture, Batch& batch, View& view) {
  capture.kind = decoding.kind;
  const bool measures = view.measures(capture);
  if (measures) {
    decode(decoding, capture, batch, [&](std::span<const Record> records) { view.measure(records); });
  }
  view.begin(capture);
  if (measures && batch.records().size() == capture.shownCount) {
    view.records(batch.records());
  } else {
    decode(decoding, capture, batch, [&](std::span<const Record> records) { view.records(records); });
  }
  view.end(capture);
}

}  // namespace kspdump
