// SPDX-License-Identifier: Apache-2.0
// Where kspdump's captures come from: what is found in which order, what is refused, what is never mistaken.

#include <archive.h>
#include <archive_entry.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <random>
#include <regex>
#include <utility>

#include "tools/kspdump/source/source.h"
#include "tools/kspdump/source/stream.h"

namespace {

namespace fs = std::filesystem;
using namespace kspdump;
using Files = std::vector<std::pair<std::string, std::string>>;

/// A capture, for these tests, begins with "ksp".
bool isCapture(std::span<const unsigned char> bytes) {
  return bytes.size() >= 3 && std::equal(bytes.begin(), bytes.begin() + 3, "ksp");
}

/// Bytes that no compression makes smaller.
std::string noise(size_t size) {
  std::mt19937 engine(static_cast<unsigned>(size));
  std::string bytes = "ksp";
  while (bytes.size() < size) bytes += static_cast<char>(engine());
  return bytes;
}

std::string packed(const Files& files, const char* format = "ustar", const char* filter = nullptr) {
  std::string bytes(size_t{8} << 20, '\0');
  size_t used = 0;
  archive* const writer = archive_write_new();
  EXPECT_EQ(archive_write_set_format_by_name(writer, format), ARCHIVE_OK);
  EXPECT_TRUE(filter == nullptr || archive_write_add_filter_by_name(writer, filter) == ARCHIVE_OK);
  archive_write_set_bytes_in_last_block(writer, 1);
  EXPECT_EQ(archive_write_open_memory(writer, bytes.data(), bytes.size(), &used), ARCHIVE_OK);
  archive_entry* const entry = archive_entry_new();
  for (const auto& [name, content] : files) {
    archive_entry_clear(entry);
    archive_entry_set_pathname(entry, name.c_str());
    archive_entry_set_perm(entry, 0644);
    archive_entry_set_filetype(entry, name.ends_with('/') ? AE_IFDIR : AE_IFREG);
    archive_entry_set_size(entry, static_cast<la_int64_t>(content.size()));
    if (content.starts_with("->")) {
      archive_entry_set_filetype(entry, AE_IFLNK);
      archive_entry_set_symlink(entry, content.c_str() + 2);
      archive_entry_set_size(entry, 0);
    }
    EXPECT_EQ(archive_write_header(writer, entry), ARCHIVE_OK);
    archive_write_data(writer, content.data(), content.size());
  }
  archive_entry_free(entry);
  EXPECT_EQ(archive_write_close(writer), ARCHIVE_OK);
  archive_write_free(writer);
  bytes.resize(used);
  return bytes;
}

std::string compressed(const std::string& bytes, const char* filter = "gzip") {
  return packed({{"x", bytes}}, "raw", filter);
}

/// Lines with each '%' in them replaced.
std::string with(const std::string& name, const std::string& lines) {
  return std::regex_replace(lines, std::regex("%"), name);
}

class SourceTest : public testing::Test {
 protected:
  SourceTest() : folder_(fs::path(testing::TempDir()) / ("source" + std::to_string(getpid()))) {
    fs::create_directories(folder_);
    fs::current_path(folder_);
  }
  ~SourceTest() override { fs::remove_all(folder_); }

  static void write(const fs::path& name, const std::string& bytes) {
    if (name.has_parent_path()) fs::create_directories(name.parent_path());
    std::ofstream(name, std::ios::binary) << bytes;
  }

  /// What a source holds, a line a capture; its bytes where they are short.
  std::string shown(Source& source) const {
    std::string lines;
    for (Input input; source.next(input);) {
      if (const std::unique_ptr<Source> within = load(input, reading_)) {
        lines += shown(*within);
        continue;
      }
      const std::span<const unsigned char> bytes = input.bytes;
      lines += input.name;
      if (input.state == Input::State::kPassedOver) lines += " passed over";
      if (input.state == Input::State::kFault) lines += ": " + input.fault;
      if (input.state == Input::State::kRead) lines += shownBytes({bytes.begin(), bytes.end()});
      lines += '\n';
    }
    return lines;
  }

  static std::string shownBytes(const std::string& bytes) {
    return bytes.size() < 20 ? "=" + bytes : " " + std::to_string(bytes.size());
  }

  std::string all(std::vector<std::string> names) const {
    Names source(std::move(names));
    return shown(source);
  }

  /// The same of one file with these bytes, and by way of standard input, from a pipe: "%" is its name.
  void expect(const std::string& bytes, const std::string& lines) const {
    write("x", bytes);
    EXPECT_EQ(all({"x"}), with("x", lines));
    FILE* const cat = popen("cat x", "r");  // NOLINT(cert-env33-c): a fixed command
    const int before = dup(STDIN_FILENO);
    dup2(fileno(cat), STDIN_FILENO);
    EXPECT_EQ(all({"-"}), with("-", lines));
    dup2(before, STDIN_FILENO);
    close(before);
    pclose(cat);
  }

  const fs::path folder_;
  Reading reading_{.isCapture = isCapture};
};

TEST_F(SourceTest, AFoldersFilesComeInTheOrderOfTheirPaths) {
  for (const auto& [name, bytes] : Files{{"b/2", "ksp2"},
                                         {"b/1", "ksp1"},
                                         {"b-c", "ksp3"},
                                         {"b0", "ksp4"},
                                         {"notes", "text"},
                                         {"packed.gz", compressed("ksp5")},
                                         {"z.tar", packed({{"in/it", "ksp6"}, {"other", "text"}})}}) {
    write("d/" + name, bytes);
  }
  fs::create_symlink("b0", "d/link");
  fs::create_directory_symlink("..", "d/up");
  ASSERT_EQ(mkfifo("d/pipe", 0600), 0);
  const std::string inside =
      "%b-c=ksp3\n%b/1=ksp1\n%b/2=ksp2\n%b0=ksp4\n%link passed over\n%notes passed over\n%packed.gz=ksp5\n"
      "%pipe passed over\n%up passed over\n%z.tar/in/it=ksp6\n%z.tar/other passed over\n";
  EXPECT_EQ(all({"d"}), with("d/", inside));
  EXPECT_EQ(all({"d//"}), with("d//", inside));
  EXPECT_EQ(all({"missing", "d/notes", "d/link"}),
            "missing: No such file or directory\nd/notes=text\nd/link=ksp4\n");
  fs::create_directories("empty/within");
  EXPECT_EQ(all({"empty"}), "");

  reading_.keepsOthers = true;
  EXPECT_EQ(all({"d/z.tar"}), "d/z.tar/in/it=ksp6\nd/z.tar/other=text\n");
}

TEST_F(SourceTest, EveryArchiveGivesItsMembers) {
  const std::string large = noise(300000);
  const Files files = {{"./a", "ksp1"},
                       {"b/", ""},
                       {"/b/c", large},
                       {"../d", "ksp2"},
                       {"e", "none"},
                       {"f", "->./a"},
                       {"g", ""},
                       {"h.gz", compressed("ksp3")},
                       {"i.tar", packed({{"j", "ksp4"}, {"k.tar", packed({{"l", "ksp5"}})}})}};
  const std::pair<const char*, const char*> packings[] = {
      {"ustar", nullptr}, {"pax", nullptr},   {"gnutar", "gzip"}, {"v7tar", "xz"},
      {"ustar", "zstd"},  {"ustar", "bzip2"}, {"zip", nullptr}};
  for (const auto& [format, filter] : packings) {
    SCOPED_TRACE(format);
    expect(packed(files, format, filter),
           "%/a=ksp1\n%/b/c 300000\n%/../d=ksp2\n%/e passed over\n%/f passed over\n%/g passed over\n"
           "%/h.gz=ksp3\n%/i.tar/j=ksp4\n%/i.tar/k.tar passed over\n");
  }
  // Blocks may be as small as 100 kB.
  std::string slight = compressed("no capture", "bzip2");
  EXPECT_EQ(std::exchange(slight[3], '1'), '9');
  expect(slight, "%=no capture\n");
  // Links in these show in the directory at their end alone.
  expect(packed({{"z", packed({{"a", "ksp1"}, {"b", "->ksp2"}}, "zip")}}), "%/z/a=ksp1\n%/z/b passed over\n");
  // Old programs fill their sums with blanks instead of zeros, and end them otherwise.
  std::string old = packed({{"a", "ksp1"}});
  EXPECT_EQ(std::exchange(old[148], ' '), '0');
  EXPECT_EQ(std::exchange(old[155], '\0'), ' ');
  expect(old, "%/a=ksp1\n");
  for (const char* const filter : {"gzip", "xz", "zstd", "bzip2"}) {
    for (const std::string& content : {large, std::string("no capture"), std::string(5000, '\0')}) {
      expect(compressed(content, filter), "%" + shownBytes(content) + "\n");
    }
  }
}

TEST_F(SourceTest, WhatIsNoArchiveIsNeverTakenForOne) {
  using std::string_literals::operator""s;
  const std::string bytesOfCases[] = {"",
                                      "#mtree\n./a type=file\n",
                                      "070707000000000000",
                                      "!<arch>\n",
                                      "7z\xBC\xAF\x27\x1C",
                                      "Rar!\x1A\x07\0"s,
                                      "BZh9 and no block",
                                      std::string(1024, '\0'),
                                      std::string(257, '1') + "ustar" + std::string(300, '1'),
                                      "PK",
                                      "\x1F\x8B"};
  for (const std::string& bytes : bytesOfCases) expect(bytes, "%" + shownBytes(bytes) + "\n");
  // Even what is one remains a capture where it makes sense as such.
  reading_.isCapture = [](auto bytes) { return bytes.size() > 1 && bytes[0] == 0x1F; };
  const std::string bytes = compressed("ksp");
  expect(bytes, "%" + shownBytes(bytes) + "\n");
}

TEST_F(SourceTest, DamagedArchivesKeepWhatIsSound) {
  const auto broken = [](std::string bytes, size_t at) {
    bytes[at] ^= 1;
    return bytes;
  };
  const Files files = {{"a", noise(50000)}, {"b", noise(300000)}, {"c", noise(70000)}};
  const std::string secondHeader = broken(packed(files), 512 + 50176);
  const std::string end = "; what follows in the archive is not read\n";
  const std::pair<std::string, std::string> cases[] = {
      {packed(files).substr(0, 300000), "x/a 50000\nx/b: [^\n]*" + end},
      {packed(files, "ustar", "gzip").substr(0, 300000), "x/a 50000\nx/b: [^\n]*" + end},
      {packed(files, "ustar", "xz").substr(0, 300000), "x/a 50000\nx/b: [^\n]*" + end},
      {packed(files, "ustar", "zstd").substr(0, 300000), "x/a 50000\nx/b: [^\n]*" + end},
      {secondHeader, "x/a 50000\nx: [^\n]*" + end},
      {broken(packed(files, "zip"), 60000), "x/a 50000\nx/b: [^\n]*\nx/c 70000\n"},
      {broken(compressed(files[0].second), 30000), "x: [^\n]*\n"},
      {"\x1F\x8B\x08rubbish", "x: [^\n]*\n"}};
  for (const auto& [bytes, lines] : cases) {
    write("x", bytes);
    EXPECT_TRUE(std::regex_match(all({"x"}), std::regex(lines))) << all({"x"}) << "is not\n" << lines;
  }
}

TEST_F(SourceTest, NothingLargerThanTheLimitIsRead) {
  reading_.greatest = 10000;
  const std::string large = ": larger than 10000 bytes (--max-size)";
  const Files files = {{"a", "ksp1"}, {"b", std::string(200000, 'k')}, {"c", "ksp2"}};
  for (const char* const format : {"ustar", "zip"}) {
    write("x", packed(files, format));
    EXPECT_EQ(all({"x"}), "x/a=ksp1\nx/b" + large + "\nx/c=ksp2\n");
  }
  expect(packed(files, "ustar", "gzip"),
         "%/a=ksp1\n%/b" + large + "; what follows in the archive is not read\n");
  expect(compressed(std::string(20000, 'k')), "%" + large + "\n");
  expect(compressed(compressed(compressed("ksp"))), "%: compressed again and again\n");
  expect(std::string(10000, 'k'), "% 10000\n");
  expect(std::string(10001, 'k'), "%" + large + "\n");
  EXPECT_EQ(all({"/dev/zero"}), "/dev/zero" + large + "\n");
  write("d/film", std::string(10001, 'k'));
  write("d/more", "ksp" + std::string(10001, 'k'));
  EXPECT_EQ(all({"d"}), "d/film passed over\nd/more" + large + "\n");

  Expansion expansion(10);
  expansion.took(5, 2);
  expansion.took(1, 0);
  expansion.gave(3010);
  EXPECT_THROW(expansion.gave(1), ReadFault);

  // Small members without end.
  reading_.greatest = 9000;
  write("x", packed(Files(600, {"z", std::string(9000, '\0')}), "ustar", "xz"));
  EXPECT_NE(all({"x"}).find("unpacks to a thousand times its size and more"), std::string::npos);
}

TEST_F(SourceTest, AListNamesFiles) {
  using std::string_literals::operator""s;
  write("a", "ksp1");
  write("b\nc", "ksp2");
  const Files cases = {
      {"a\0b\nc\0\0missing\0a"s,
       "a=ksp1\nb\nc=ksp2\nlist: its name 3 is empty\nmissing: No such file or directory\na=ksp1\n"},
      {"", ""},
      {"a\nb\n", "list: its names end with newlines instead of NULs\n"},
      {std::string(100000, 'x'), "list: it has no names that end with NULs\n"}};
  for (const auto& [list, lines] : cases) {
    write("list", list);
    EXPECT_EQ(shown(*namesFrom("list")), lines);
  }
  EXPECT_EQ(shown(*namesFrom("none")), "none: No such file or directory\n");
}

TEST_F(SourceTest, OneCaptureIsOne) {
  write("one.tar", packed({{"readme", "text"}, {"a", "ksp1"}}));
  write("two.tar", packed({{"a", "ksp1"}, {"b", "ksp2"}}));
  write("none.tar", packed({{"readme", "text"}}));
  EXPECT_EQ(loadOne("one.tar", reading_).name, "one.tar/a");
  EXPECT_EQ(loadOne("two.tar", reading_).fault, "holds more than one capture");
  EXPECT_EQ(loadOne("none.tar", reading_).fault, "holds no capture of the kind");
}

}  // namespace
