// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <unistd.h>

#include <string>
#include <string_view>

namespace kspdump {

/// Where the results go: standard output, or a file that takes its name only once it is whole.
///
/// What exists under that name stays as it was until then; a pipe, a device or an open descriptor's name is
/// written to directly. A
/// reader that goes away ends the program as the system does, without a word.
class Output {
 public:
  /// An empty path or "-" is standard output. Throws std::system_error.
  explicit Output(std::string path);
  Output(const Output&) = delete;
  Output& operator=(const Output&) = delete;
  ~Output();

  /// Throws std::system_error.
  void write(std::string_view text);

  /// Gives the file its name; without this call it is gone. Throws std::system_error.
  void finish();

  bool isTerminal() const { return isatty(descriptor_) != 0; }

 private:
  [[noreturn]] void fail(const char* what) const;

  std::string path_;
  std::string target_;
  std::string unfinished_;
  int descriptor_;
};

}  // namespace kspdump
