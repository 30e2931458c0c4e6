// SPDX-License-Identifier: Apache-2.0
// Host files: what they may say, and the one line that names each fault.

#include <sys/stat.h>

#include "platform/host/host_file.h"
#include "platform/host/screen.h"
#include "tests/folder.h"

namespace {

namespace fs = std::filesystem;

class HostFile : public FolderTest {};

// The daemon's own tests see what follows from each key; here are the other ways to write them.
TEST_F(HostFile, KeysMayStandInlineDottedAndInHexadecimal) {
  const host::HostFile file = host::parseHostFile(
      "activity = { identifier = \"x\", interval_s = 3 }\nmetrics.file = '/run/x'\nyield.at_check = 6\n"
      "[[controller]]\nclass = \"KSPStorage\"\nsteps = [7, { reply = 8, result = 0xFFFFFFFF }]\n",
      "name");
  EXPECT_EQ(file.activity.identifier, "x");
  EXPECT_EQ(file.activity.intervalSeconds, 3u);
  EXPECT_EQ(file.metricsFile, "/run/x");
  EXPECT_EQ(file.yield.atCheck, 6u);
  ASSERT_EQ(file.controllers.at(0).steps.size(), 2u);
  EXPECT_EQ(file.controllers[0].steps[0].reply, 7u);
  EXPECT_EQ(file.controllers[0].steps[1].reply, 8u);
  EXPECT_EQ(file.controllers[0].steps[1].result, -1);
}

std::string faultOf(const std::string& path) {
  try {
    host::loadHostFile(path);
    return "accepted";
  } catch (const host::HostFileError& fault) {
    return fault.what();
  }
}

// Beside each wrong file stands what is said of it behind its name: line and reason.
TEST_F(HostFile, FaultsNameFileLineAndReason) {
  int faults = 0;
  for (const auto& entry : fs::directory_iterator(KSP_TEST_DATA "/hosts")) {
    const fs::path& file = entry.path();
    if (file.extension() != ".toml") continue;
    const std::string said = faultOf(file);
    std::string expected = textOf(fs::path(file).replace_extension(".txt"));
    expected.pop_back();
    // The parser's own words for broken TOML go on behind the expected ones.
    EXPECT_EQ(said.substr(0, file.string().size() + 1 + expected.size()), file.string() + ":" + expected);
    EXPECT_EQ(said.find('\n'), std::string::npos);
    ++faults;
  }
  EXPECT_GE(faults, 20);
}

TEST_F(HostFile, UnreadableFilesSayWhy) {
  EXPECT_EQ(faultOf("no/such/file"), "no/such/file: cannot be read: No such file or directory");
  EXPECT_EQ(faultOf("/"), "/: cannot be read: it is not a regular file");
  EXPECT_EQ(faultOf("/dev/zero"), "/dev/zero: cannot be read: it is not a regular file");
  EXPECT_EQ(faultOf("no\xe0\x82\x9b\xf0\x80\x82\x9b"), "no???????: cannot be read: No such file or directory")
      << "nor one in more bytes than it takes";
  EXPECT_EQ(faultOf("no/such/\x1b\xc2\x9b\x9b\xe2\x82\xac"),
            "no/such/????\xe2\x82\xac: cannot be read: No such file or directory")
      << "no control character is shown, the euro sign is";
}

TEST_F(HostFile, OnlyRegularFilesOfSixtyFourKibibytesAreRead) {
  const std::string comment = "# " + std::string(100, '.') + "\n[activity]\nidentifier = \"x\"\n#";
  write("longest", comment + std::string(65536 - 1 - comment.size(), ' '));
  EXPECT_EQ(faultOf(path("longest")), "accepted");
  write("longer", comment + std::string(65536 - comment.size(), ' '));
  EXPECT_EQ(faultOf(path("longer")), path("longer") + ": cannot be read: it is larger than 64 KiB");
  ASSERT_EQ(mkfifo(path("pipe").c_str(), 0600), 0);
  EXPECT_EQ(faultOf(path("pipe")), path("pipe") + ": cannot be read: it is not a regular file");
  fs::create_symlink("nowhere", folder_ / "link");
  EXPECT_EQ(faultOf(path("link")), path("link") + ": cannot be read: it is a link that leads nowhere");
}

// Each place is asked in turn; one that holds a wrong file is not passed over.
TEST_F(HostFile, TheHostFileIsLookedForInThreePlaces) {
  const auto writeHost = [&](const char* name) {
    write(name, std::string("[activity]\nidentifier = \"") + name + "\"");
  };
  const auto found = [&](const char* named, const char* credentials) {
    try {
      return host::findHostFile(named, credentials, path("system").c_str()).activity.identifier;
    } catch (const host::HostFileError& fault) {
      return std::string(fault.what()).substr(folder_.string().size() + 1);
    }
  };
  const std::string credentials = path("credentials");
  EXPECT_EQ(found(nullptr, nullptr), "");
  EXPECT_EQ(found("", credentials.c_str()), "");
  writeHost("system");
  EXPECT_EQ(found("", credentials.c_str()), "system");
  fs::create_directories(credentials);
  EXPECT_EQ(found(nullptr, credentials.c_str()), "system");
  writeHost("credentials/brellium_host.toml");
  EXPECT_EQ(found(nullptr, credentials.c_str()), "credentials/brellium_host.toml");
  EXPECT_EQ(found(path("named").c_str(), credentials.c_str()),
            "named: cannot be read: No such file or directory");
  writeHost("named");
  EXPECT_EQ(found(path("named").c_str(), credentials.c_str()), "named");
  fs::remove(folder_ / "system");
  fs::create_symlink("nowhere", folder_ / "system");
  EXPECT_EQ(found(nullptr, nullptr), "system: cannot be read: it is a link that leads nowhere");
}

TEST_F(HostFile, WhatTheParserCannotTakeIsRefusedBeforeItSeesIt) {
  const struct {
    std::string text;
    std::optional<unsigned> line;
  } cases[] = {
      {"a.b.c.d.e.f.g.h = 1.5\n", std::nullopt},
      {"a.b.c.d.e.f.g.h.i = 1\n", 1},
      {"a = 1\n\n[a.b.c.d.e.f.g.h.i]\n", 3},
      {"a = [1.5, 1.5, 1.5, 1.5, 1.5, 1.5, 1.5, 1.5, 1.5]", std::nullopt},
      {"a = [[[[[[[[ ]]]]]]]]\nb = [[[[[[[[ ]]]]]]]]", std::nullopt},
      {"a = [\n[[[\n{ b = [[[[", 3},
      {"a.b = 1 # . . . . . . . . . [[[[[[[[[\nc = '.........' # [\n", std::nullopt},
      {R"(a = "\"........." # ")", std::nullopt},
      {"a = '\\' # '\na.b.c.d.e.f.g.h.i = 1", 2},
      {"a = \"\" # [[[[[[[[[\nb = ''\n\n\"\"\"\"\"\" = 1", 4},
      {"a = '''b'''", 1},
      {"a = \".........\na.b.c.d.e.f.g.h.i = 1", 2},
      {std::string(300000, ']') + std::string(8, '['), std::nullopt},
      {"\"", std::nullopt},
      {"\"\\", std::nullopt},
      {"\xEF\xBB\xBF a = '' # \xC3\xA9\nb = '\xC3\xA9'", 2},
  };
  for (const auto& [text, line] : cases) {
    const auto objection = host::objectionTo(text);
    EXPECT_EQ(objection ? std::optional(objection->line) : std::nullopt, line) << text.substr(0, 80);
  }
}

}  // namespace
