// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/view/page/page.h"

#include <algorithm>
#include <stdexcept>
#include <unordered_map>

#include "tools/kspdump/view/text.h"

namespace kspdump {

namespace {

constexpr std::string_view kOpening = "{{";
constexpr std::string_view kClosing = "}}";

/// Parts of the page by their names.
using Parts = std::unordered_map<std::string_view, std::string_view>;

Parts partsOf(std::string_view page) {
  constexpr std::string_view kMark = "<!-- part ";
  constexpr std::string_view kMarkEnd = " -->\n";
  Parts parts;
  for (size_t at = page.find(kMark); at != page.npos; at = page.find(kMark)) {
    page.remove_prefix(at + kMark.size());
    const std::string_view name = page.substr(0, page.find(kMarkEnd));
    page.remove_prefix(name.size() + kMarkEnd.size());
    parts[name] = page.substr(0, page.find(kMark));
  }
  return parts;
}

}  // namespace

void appendHtml(std::string& out, std::string_view text) {
  for (const char c : legible(text)) {
    switch (c) {
      case '&':
        out += "&amp;";
        break;
      case '<':
        out += "&lt;";
        break;
      case '>':
        out += "&gt;";
        break;
      case '"':
        out += "&quot;";
        break;
      case '\'':
        out += "&#39;";
        break;
      default:
        out += c;
    }
  }
}

void appendPart(std::string& out, std::string_view part, std::initializer_list<Field> fields) {
  static const Parts kParts = partsOf(kPageHtml.text);
  const auto found = kParts.find(part);
  if (found == kParts.end()) throw std::logic_error("page.html has no part " + std::string(part));
  std::string_view rest = found->second;
  for (size_t at = rest.find(kOpening); at != rest.npos; at = rest.find(kOpening)) {
    out += rest.substr(0, at);
    rest.remove_prefix(at + kOpening.size());
    const std::string_view name = rest.substr(0, rest.find(kClosing));
    rest.remove_prefix(name.size() + kClosing.size());
    const auto* const field =
        std::find_if(fields.begin(), fields.end(), [&](const Field& each) { return each.name == name; });
    if (field == fields.end()) throw std::logic_error("nobody fills in " + std::string(name));
    if (field->form == Field::Form::kMarkup) {
      out += field->value;
    } else {
      appendHtml(out, field->value);
    }
  }
  out += rest;
}

}  // namespace kspdump
