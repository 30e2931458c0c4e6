// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <initializer_list>
#include <string>
#include <string_view>

namespace kspdump {

/// A file of this room, or of the chart library, as it was when the program was built.
struct Embedded {
  std::string_view text;
  /// As a content security policy names it: 'sha256-...'.
  std::string_view hash;
};

extern const Embedded kPageHtml;
extern const Embedded kPageStyle;
extern const Embedded kPageScript;
extern const Embedded kChartScript;

/// What a placeholder of the page stands for. A text may contain anything: it is shown, never run.
struct Field {
  enum class Form { kText, kMarkup };

  std::string_view name;
  std::string_view value;
  Form form = Form::kText;
};

/// Appends a text to a page, and as UTF-8.
void appendHtml(std::string& out, std::string_view text);

/// Appends a part of page.html: what stands behind the comment that names it, with its placeholders, as in
/// {{name}}, filled in. A part or a placeholder that nobody knows ends in std::logic_error.
void appendPart(std::string& out, std::string_view part, std::initializer_list<Field> fields = {});

}  // namespace kspdump
