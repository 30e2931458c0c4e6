// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "tools/kspdump/view/view.h"

namespace kspdump {

/// One maker a form, each in the file of its name.
std::unique_ptr<View> makeTable(const ViewOptions& options, Sink& sink);
std::unique_ptr<View> makeReport(const ViewOptions& options, Sink& sink);
std::unique_ptr<View> makeChart(const ViewOptions& options, Sink& sink);
std::unique_ptr<View> makeJson(const ViewOptions& options, Sink& sink);
std::unique_ptr<View> makeCsv(const ViewOptions& options, Sink& sink);
std::unique_ptr<View> makeHtml(const ViewOptions& options, Sink& sink);
std::unique_ptr<View> makeMetrics(const ViewOptions& options, Sink& sink);

}  // namespace kspdump
