// SPDX-License-Identifier: Apache-2.0
// The real kspdump on captures: what it prints, what it names, how it ends.

#include <sys/wait.h>

#include <algorithm>
#include <cstdlib>
#include <deque>

#include "tests/folder.h"
#include "tests/streams.h"

namespace {

namespace fs = std::filesystem;

class Kspdump : public FolderTest {
 protected:
  void writeBytes(const std::string& name, const std::string& bytes) const {
    std::ofstream(path("in/" + name), std::ios::binary) << bytes;
  }

  /// What a command of the shell says in the folder `in`, a line each, as the cases have it.
  std::deque<std::string> said(const std::string& command) const {
    setenv("COMMAND", command.c_str(), 1);
    const std::string shell = "cd '" + path("in") +
                              "' && PATH=" KSP_PROGRAMS ":$PATH CAPTURES=" KSP_EXAMPLE_CAPTURES
                              " DATA=" KSP_TEST_DATA
                              " LC_ALL=C bash -o pipefail -c \"$COMMAND\" >../out 2>../err";
    const int status = std::system(shell.c_str());  // NOLINT(cert-env33-c): a shell is where people run it
    std::deque<std::string> lines;
    for (const auto& [mark, text] : {std::pair(std::string(), read("out")), {"2> ", read("err")}}) {
      std::istringstream stream(text);
      for (std::string line; std::getline(stream, line);) {
        if (!line.empty()) lines.push_back(mark + line);
      }
    }
    if (status != 0) lines.push_back("? " + std::to_string(WIFEXITED(status) ? WEXITSTATUS(status) : -1));
    return lines;
  }

  void startAfresh() const {
    fs::remove_all(path("in"));
    fs::create_directories(path("in"));
  }
};

TEST_F(Kspdump, Cases) {
  std::ifstream file(KSP_KSPDUMP_CASES);
  std::string what, expected, seen;
  std::deque<std::string> printed;
  int commands = 0;
  const auto check = [&] {
    for (const std::string& rest : std::exchange(printed, {})) seen += rest + '\n';
    EXPECT_EQ(std::exchange(seen, ""), std::exchange(expected, "")) << what;
  };
  for (std::string line; std::getline(file, line);) {
    const std::string word = line.substr(0, line.find(' '));
    if (word == "case") {
      check();
      startAfresh();
      what = line;
    } else if (what.empty() || line.empty()) {
      continue;
    } else if (word == "stats" || word == "media") {
      const size_t end = std::min(line.find(' ', 6), line.size());
      const auto asText = [](const unsigned char* bytes, uint32_t size) {
        return std::string(bytes, bytes + size);
      };
      writeBytes(line.substr(6, end - 6), ksp::test::Stream(line.substr(end), word == "media").into(asText));
    } else if (word == "$") {
      check();
      for (std::string more; line.ends_with('\\') && std::getline(file, more);) line += '\n' + more;
      seen = expected = line + '\n';
      printed = said(line.substr(2));
      ++commands;
    } else {
      expected += line + '\n';
      if (printed.empty()) continue;
      const bool isBegun = line.ends_with("...") && printed[0].starts_with(line.substr(0, line.size() - 3));
      seen += (isBegun ? line : printed[0]) + '\n';
      printed.pop_front();
    }
  }
  check();
  EXPECT_GT(commands, 90) << "cases were lost";
}

TEST_F(Kspdump, NoiseIsNoSoundCapture) {
  startAfresh();
  uint64_t state = 1;
  for (size_t i = 0; i < 40; ++i) {
    std::string noise(std::vector{64U, 504U, 2520U, 65536U}[i % 4], '\0');
    for (char& c : noise)
      c = static_cast<char>((state = state * 6364136223846793005 + 1442695040888963407) >> 56);
    writeBytes(std::to_string(i), noise);
  }
  for (const char* command :
       {"40 kspdump stats", "40 kspdump summary", "40 kspdump media", "1 kspdump snapshot"}) {
    const auto lines = said("ls | xargs -n " + std::string(command) + " --format csv");
    for (size_t i = 0; i < 40; ++i) {
      const std::string finding = "2> kspdump: " + std::to_string(i) + ": offset ";
      EXPECT_TRUE(std::ranges::any_of(lines, [&](const auto& line) { return line.starts_with(finding); }))
          << command << i;
    }
  }
}

}  // namespace
