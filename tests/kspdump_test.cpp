// SPDX-License-Identifier: Apache-2.0
// The real kspdump on captures: what it prints, what it names, how it ends.

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>
#include <regex>
#include <sstream>

namespace {

namespace fs = std::filesystem;
using nlohmann::json;

std::string readAll(const fs::path& file) {
  std::ifstream stream(file, std::ios::binary);
  return {std::istreambuf_iterator<char>(stream), {}};
}

template <unsigned width>
std::string numbers(std::initializer_list<uint64_t> values) {
  std::string bytes;
  for (const uint64_t value : values) {
    for (unsigned i = 0; i < width; ++i) bytes += static_cast<char>(value >> (8 * i));
  }
  return bytes;
}

std::string record(uint32_t key, std::initializer_list<uint64_t> values) {
  return numbers<4>({key, values.size()}) + numbers<8>(values);
}

std::string media(uint16_t key, const std::string& value) {
  return numbers<2>({key, value.size()}) + value;
}

/// A record of a fixed snapshot: its timestamp, and no activity.
std::string interval(uint64_t time) {
  return numbers<4>({time}) + std::string(248, '\0');
}

struct Outcome {
  int status;
  std::string out;
  std::string err;
};

class Kspdump : public testing::Test {
 protected:
  Kspdump() : folder_(fs::path(testing::TempDir()) / ("kspdump" + std::to_string(getpid()))) {
    fs::create_directories(folder_);
  }
  ~Kspdump() override { fs::remove_all(folder_); }

  void write(const std::string& name, const std::string& bytes) const {
    std::ofstream(folder_ / name, std::ios::binary) << bytes;
  }

  /// Runs a shell command in which KSPDUMP is the program.
  Outcome shell(const std::string& command) const {
    const std::string line = "cd '" + folder_.string() + "' && { " + command + "; } >.out 2>.err";
    // NOLINTNEXTLINE(cert-env33-c): a shell is where people run it
    const int status = std::system(("KSPDUMP=" KSP_KSPDUMP "; " + line).c_str());
    return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, readAll(folder_ / ".out"),
            readAll(folder_ / ".err")};
  }

  Outcome run(const std::string& arguments) const { return shell("$KSPDUMP " + arguments); }

  const fs::path folder_;
};

/// hostWrites twice, perHostReads (an array of 2) and an unknown key; then an end marker, and zeros.
const std::string kStats = record(4, {18446744073709551615U}) + record(298, {7, 9}) + record(900, {1}) +
                           record(4, {5}) + record(0xFFFF, {1}) + std::string(7, '\0');

TEST_F(Kspdump, JsonKeepsEveryRecordInOrderAndExact) {
  write("a \"b\".stats", kStats);
  const Outcome result = run("stats --format json 'a \"b\".stats'");
  EXPECT_EQ(result.status, 0) << result.err;
  EXPECT_EQ(json::parse(result.out),
            json::parse(R"({"source":"a \"b\".stats","kind":"stats","bytes":95,"findings":[],"records":[
              {"key":4,"name":"hostWrites","values":[18446744073709551615]},
              {"key":298,"name":"perHostReads","values":[7,9]},
              {"key":900,"name":"Stat_900","values":[1]},
              {"key":4,"name":"hostWrites","values":[5]}]})"));
  EXPECT_EQ(std::count(result.out.begin(), result.out.end(), '\n'), 1);

  // More text than is written at a time.
  std::string many;
  for (uint64_t i = 0; i < 5000; ++i) many += record(4, {i});
  write("many.stats", many);
  const json records = json::parse(run("stats --format json many.stats").out)["records"];
  ASSERT_EQ(records.size(), 5000u);
  for (uint64_t i = 0; i < 5000; ++i) EXPECT_EQ(records[i]["values"], json({i}));

  write("n.stats", record(298, {7, 9}));
  EXPECT_EQ(json::parse(run("stats --numbers --format json n.stats").out)["records"],
            json::parse(R"([{"key":298,"name":"Stat_298","values":[7,9]}])"));
}

TEST_F(Kspdump, TablesShowArraysAsSumAndPicture) {
  write("a.stats", kStats);
  write("h.stats", record(14, {0, 1, 2, 3, 4, 5, 6, 7, 8, 0}) + record(4, {12}));
  const std::string head =
      "h.stats: statistics, 104 bytes, 2 records\n"
      "  KEY  NAME               VALUE/SUM  ELEMENTS\n"
      "   14  hostWriteLogHisto         36  ";
  const std::string tail = "\n    4  hostWrites                12\n";
  EXPECT_EQ(shell("LC_ALL=C $KSPDUMP stats h.stats").out, head + "_.:-=+*#@_" + tail);
  EXPECT_EQ(shell("LC_ALL=C.UTF-8 $KSPDUMP stats h.stats").out, head + "·▁▂▃▄▅▆▇█·" + tail);
  constexpr uint64_t kUnit = uint64_t{1} << 60;
  write("g.stats",
        record(14, {0, kUnit, 4 * kUnit, 4 * kUnit + 1, 8 * kUnit}) + record(15, {8000, 1000, 1001}));
  const std::string pictures = shell("LC_ALL=C $KSPDUMP stats g.stats").out;
  EXPECT_NE(pictures.find(" 19599665578316398593  _.=+@\n"), std::string::npos) << pictures;
  EXPECT_NE(pictures.find(" 10001  @.:\n"), std::string::npos) << pictures;
  EXPECT_EQ(run("stats --match '*Reads' a.stats").out.substr(0, 55),
            "a.stats: statistics, 95 bytes, 4 records, 1 shown\n  KEY");
}

TEST_F(Kspdump, CsvHasARowAValue) {
  write("a,b.stats", record(4, {12}) + record(298, {7, 9}));
  EXPECT_EQ(run("stats --format csv a,b.stats").out,
            "source,kind,key,name,element,value\n"
            "\"a,b.stats\",stats,4,hostWrites,,12\n"
            "\"a,b.stats\",stats,298,perHostReads,0,7\n"
            "\"a,b.stats\",stats,298,perHostReads,1,9\n");
}

TEST_F(Kspdump, MetricsAreOneFamilyAKind) {
  write("a.media", media(8212, numbers<4>({1, 2, 3, 4})) + media(4096, numbers<4>({5})));
  write("b\\.media", media(4096, numbers<4>({6})) + media(4096, numbers<4>({7})));
  const Outcome result = run("media --format openmetrics a.media 'b\\.media'");
  EXPECT_EQ(result.out,
            "ksp_media{source=\"a.media\",key=\"8212\",name=\"open_blocks_hist\",element=\"0\"} 1\n"
            "ksp_media{source=\"a.media\",key=\"8212\",name=\"open_blocks_hist\",element=\"1\"} 2\n"
            "ksp_media{source=\"a.media\",key=\"8212\",name=\"open_blocks_hist\",element=\"2\"} 3\n"
            "ksp_media{source=\"a.media\",key=\"8212\",name=\"open_blocks_hist\",element=\"3\"} 4\n"
            "ksp_media{source=\"a.media\",key=\"4096\",name=\"passWithTmodeHard\"} 5\n"
            "ksp_media{source=\"b\\\\.media\",key=\"4096\",name=\"passWithTmodeHard\"} 7\n"
            "# EOF\n");
  EXPECT_EQ(result.err,
            "kspdump: b\\.media: offset 0: passWithTmodeHard(4096) comes again; its last record stands\n");
  EXPECT_EQ(result.status, 1);
}

TEST_F(Kspdump, FindingsNameOffsetAndReason) {
  const std::string sound = record(14, {0, 1, 2, 3, 4, 5, 6, 7, 8, 9});
  const std::string value = numbers<4>({5});
  const std::string soundMedia = media(8212, numbers<4>({1, 2, 3, 4}));
  const std::string end = record(0xFFFF, {1});
  const struct {
    const char* command;
    std::string bytes;
    std::string finding;
    size_t records;
  } cases[] = {
      {"stats", "", "offset 0: the capture is empty", 0},
      {"stats", sound + "abc", "offset 88: 3 bytes left over, fewer than a word", 1},
      {"stats", sound + numbers<4>({5, 3}) + sound.substr(0, 16),
       "offset 88: key 5 announces 3 values, but the capture ends after 2", 1},
      {"stats", sound + numbers<4>({0x30000001, 1}) + sound.substr(0, 16),
       "offset 88: key 805306369 is invalid, so the rest cannot be read", 1},
      {"stats", sound + record(15, {1, 2}), "offset 88: hostReadLogHisto(15) carries 2 values, 10 configured",
       2},
      {"stats", std::string(64, '\0'), "offset 0: there is nothing in it but zeros", 0},
      {"stats", sound + end + std::string(9, '\0') + sound.substr(0, 40),
       "offset 113: 40 bytes behind the end marker that are not all zeros, and not read", 1},
      {"stats", sound + numbers<4>({0xFFFF, 3}) + sound.substr(0, 16),
       "offset 96: 16 bytes behind the end marker that are not all zeros, and not read", 1},
      {"stats", media(4096, numbers<4>({0})), "offset 0: looks like media statistics, 100 % recognised", 0},
      {"stats", record(900, {1}), "offset 0: does not look like statistics: 0 % recognised", 1},
      {"summary", sound + numbers<4>({5, 3}),
       "offset 88: key 5 announces 3 values, but the capture ends after 0", 0},
      {"media", soundMedia + "abc", "offset 20: 3 bytes left over, fewer than a record's header", 1},
      {"media", soundMedia + numbers<2>({4097, 4}),
       "offset 20: key 4097 announces 4 bytes, but the capture ends after 0", 1},
      {"media", media(4096, value + "a"), "offset 0: passWithTmodeHard(4096) carries 5 bytes, 4 configured",
       1},
      {"media", media(4096, value.substr(1)),
       "offset 0: passWithTmodeHard(4096) carries 3 bytes, 4 configured", 0},
      {"media", soundMedia + media(9, value + "ab"),
       "offset 20: Media_9(9) carries 6 bytes, 2 left over, fewer than an element of 4", 2},
      {"media", soundMedia + media(0x2FFF, value) + "\1",
       "offset 28: 1 byte behind the end record that is not zero, and not read", 1},
      {"media", sound, "offset 0: looks like statistics, 100 % recognised", 0},
      {"snapshot", std::string(504, '\0'), "offset 0: there is nothing in it but zeros", 52},
      {"snapshot", interval(1) + "\1", "offset 252: 1 byte left over, fewer than a record", 26},
      {"snapshot", interval(1) + interval(2) + interval(4) + interval(3) + interval(2),
       "offset 1008: the timestamps fall 2 times, those of a snapshot once at most", 130},
  };
  for (const auto& [command, bytes, finding, records] : cases) {
    write("x", bytes);
    const Outcome result = run(std::string(command) + " --format json x");
    EXPECT_EQ(result.status, 1);
    EXPECT_EQ(result.err, "") << "findings stand once";
    EXPECT_EQ(run(std::string(command) + " --format csv x").err, "kspdump: x: " + finding + "\n");
    const std::string table = run(std::string(command) + " --format table x").out;
    EXPECT_TRUE(table.ends_with("! " + finding + "\n")) << table;
    const json document = json::parse(result.out);
    EXPECT_EQ(document["records"].size(), records) << finding;
    ASSERT_EQ(document["findings"].size(), 1u);
    EXPECT_EQ("offset " + document["findings"][0]["offset"].dump() + ": " +
                  document["findings"][0]["reason"].get<std::string>(),
              finding);
  }
}

TEST_F(Kspdump, ManyFilesComeOutInOrderWhateverTheJobs) {
  std::string files;
  for (int i = 0; i < 60; ++i) {
    const std::string name = "f" + std::to_string(i);
    std::string bytes;
    for (int k = 0; k < (i % 7) * 100; ++k) bytes += record(4, {static_cast<uint64_t>(i)});
    write(name, bytes + record(5, {1}));
    files += " " + name + (i == 30 ? " missing" : "");
  }
  const Outcome alone = run("stats --format json --jobs 1" + files);
  const Outcome together = run("stats --format json --jobs 8" + files);
  EXPECT_EQ(alone.status, 3);
  EXPECT_EQ(alone.err, "kspdump: missing: cannot be read: No such file or directory\n");
  EXPECT_EQ(together.out, alone.out);
  EXPECT_EQ(together.err, alone.err);
  std::istringstream lines(alone.out);
  int next = 0;
  for (std::string line; std::getline(lines, line); ++next) {
    EXPECT_EQ(json::parse(line)["source"], "f" + std::to_string(next));
  }
  EXPECT_EQ(next, 60);

  // Folders and archives, within each other too, are found on the way.
  fs::create_directories(folder_ / "d/e");
  write("d/notes", "no capture");
  ASSERT_EQ(shell("cp f* d/e && tar czf d/a.tar.gz f? && tar cf d/e/f35.tar f1? d/a.tar.gz").status, 0);
  const Outcome found = run("stats --format csv --jobs 1 f1 d f2 d/e/f35.tar missing d/notes");
  EXPECT_EQ(found.status, 3);
  EXPECT_EQ(found.err.substr(0, found.err.find('\n')),
            "kspdump: d: passed over 1 file that is no statistics capture");
  for (const char* jobs : {"2", "3", "16"}) {
    const Outcome same =
        run(std::string("stats --format csv --jobs ") + jobs + " f1 d f2 d/e/f35.tar missing d/notes");
    EXPECT_EQ(same.out, found.out) << jobs;
    EXPECT_EQ(same.err, found.err) << jobs;
  }
  std::vector<std::string> order;
  std::istringstream rows(found.out);
  for (std::string row; std::getline(rows, row);) {
    if (order.empty() || order.back() != row.substr(0, row.find(',')))
      order.push_back(row.substr(0, row.find(',')));
  }
  EXPECT_EQ(order.size(), 1 + 1 + 10 + 60 + 20 + 1 + 20u);
  EXPECT_EQ(order[2], "d/a.tar.gz/f0");
  EXPECT_EQ(order[42], "d/e/f35.tar/f10");
  EXPECT_EQ(order[61], "d/e/f35.tar/d/a.tar.gz/f9");
  EXPECT_EQ(order[62], "d/e/f36");
  EXPECT_EQ(order[92], "f2");
  fs::create_directory(folder_ / "empty");
  EXPECT_EQ(run("stats empty").err, "kspdump: empty: holds no statistics capture\n");
}

TEST_F(Kspdump, TheFixedSnapshotIsTheLibrarysReport) {
  const std::string data = KSP_TEST_DATA "/snapshot/report_example";
  EXPECT_EQ(run("snapshot " + data + ".records").out, readAll(data + ".txt"));
  // More records than are rendered at a time.
  const std::string one = readAll(data + ".records").substr(0, 252);
  std::string many;
  for (int i = 0; i < 5000; ++i) many += one;
  write("many", many);
  const std::string report = run("snapshot - < many").out;
  const std::string line = report.substr(1337, report.find('\n', 1337) - 1336);
  ASSERT_EQ(report.size(), 1337 + 5000 * line.size() + 1);
  for (size_t i = 0; i < 5000; ++i)
    ASSERT_EQ(report.compare(1337 + i * line.size(), line.size(), line), 0) << i;
}

TEST_F(Kspdump, AHeadersSnapshotLosesNoLineAtTheEndOfAPage) {
  // One descriptor whose line is 900 characters wide: some thousand lines need several pages.
  const std::string format = "%900u";
  write("h", numbers<4>({0, 6, 4, 3001, 0, 0, 40, 0, 0}) + std::string("New\0", 4) +
                 numbers<4>({1, 0, 0, 0, 4}) + format + std::string(16 - format.size(), '\0'));
  std::string records;
  for (uint64_t i = 1; i <= 3001; ++i) records += numbers<4>({i % 10 == 0 ? 0 : i});
  write("r", records);
  const Outcome result = run("snapshot --header h r");
  EXPECT_EQ(result.status, 0) << result.err;
  std::istringstream lines(result.out);
  uint64_t expected = 1;
  int captures = 0;
  for (std::string line; std::getline(lines, line);) {
    if (line.size() == 900) {
      EXPECT_EQ(std::stoull(line), expected);
      expected += expected % 10 == 9 ? 2 : 1;
    } else if (line.starts_with("Captured at: ")) {
      ++captures;
    }
  }
  EXPECT_EQ(expected, 3001u);
  EXPECT_GT(captures, 5);
  EXPECT_EQ(json::parse(run("snapshot --header h --format json r").out)["records"][8],
            json::parse(R"({"key":8,"name":"field0","values":[9]})"));

  write("h", "short");
  EXPECT_EQ(run("snapshot --header h r").err, "kspdump: h: the header is shorter than its fixed 36 bytes\n");
  EXPECT_EQ(run("snapshot --header h r").status, 3);
}

TEST_F(Kspdump, DiffTellsWhatChanged) {
  write("old", record(4, {18446744073709551615U}) + record(298, {7, 9}) + record(5, {1}) + record(5, {2}));
  write("new", record(5, {1}) + record(5, {3}) + record(4, {0}) + record(298, {7, 10}) + record(900, {4}));
  EXPECT_EQ(
      json::parse(run("diff stats --format json old new").out)["changes"],
      json::parse(
          R"([{"key":4,"name":"hostWrites","old":[18446744073709551615],"new":[0],"delta":[-18446744073709551615]},
              {"key":5,"name":"hostWritesDyn","old":[2],"new":[3],"delta":[1]},
              {"key":298,"name":"perHostReads","old":[7,9],"new":[7,10],"delta":[0,1]},
              {"key":900,"name":"Stat_900","old":[null],"new":[4],"delta":[null]}])"));
  EXPECT_EQ(run("diff stats --match 'hostW*s' --format csv old new").out,
            "source,kind,key,name,element,old,new,delta\n"
            "new,stats,4,hostWrites,,18446744073709551615,0,-18446744073709551615\n");
  EXPECT_EQ(shell("LC_ALL=C $KSPDUMP diff stats --match 'perHost*' old new").out,
            "old -> new: 1 changed\n"
            "KEY  NAME          OLD  NEW  DELTA     %  ELEMENTS\n"
            "298  perHostReads   16   17     +1  +6.2  _@\n");
  EXPECT_EQ(run("diff media old new").status, 1);
  EXPECT_EQ(run("diff stats old").status, 2);
}

TEST_F(Kspdump, ChangesAreRankedAndSigned) {
  write("old", record(4, {100}) + record(5, {10}) + record(7, {8}) + record(298, {9, 1}) + record(20, {0}));
  write("new", record(4, {90}) + record(5, {30}) + record(7, {8}) + record(298, {1, 9}) + record(20, {5}));
  const struct {
    const char* options;
    const char* keys;
  } cases[] = {
      {"", "[4,5,20,298]"},
      {"--all", "[4,5,7,20,298]"},
      {"--sort name", "[20,4,5,298]"},
      {"--sort change", "[5,4,20,298]"},
      {"--sort percent", "[5,4,20,298]"},
      {"--sort change --top 1", "[5]"},
  };
  for (const auto& [options, keys] : cases) {
    json shown = json::array();
    const json document = json::parse(run(std::string("diff stats --format json old new ") + options).out);
    for (const json& each : document["changes"]) shown.push_back(each["key"]);
    EXPECT_EQ(shown, json::parse(keys)) << options;
  }
  EXPECT_EQ(shell("LC_ALL=C $KSPDUMP diff stats --key 5 --key 298 old new").out,
            "old -> new: 2 changed\n"
            "KEY  NAME           OLD  NEW  DELTA       %  ELEMENTS\n"
            "  5  hostWritesDyn   10   30    +20  +200.0\n"
            "298  perHostReads    10   10      0     0.0  V@\n");
  EXPECT_EQ(json::parse(run("diff summary --format json old new").out)["changes"].size(), 2u);
}

TEST_F(Kspdump, TrendsGoOverCapturesOrAStatistic) {
  write("a", record(34, {30}) + record(4, {100}) + record(298, {1, 2}));
  write("b", record(34, {10}) + record(4, {40}) + record(900, {7}));
  write("c", record(34, {20}) + record(4, {70}) + record(298, {3, 4}));
  write("d", record(4, {1}));
  EXPECT_EQ(json::parse(run("trend stats --format json a b c").out), json::parse(R"({"kind":"stats",
    "sources":["a","b","c"],"over":null,"findings":[],"series":[{"key":4,"name":"hostWrites","values":[100,40,70]},
    {"key":34,"name":"powerOnHours","values":[30,10,20]},
    {"key":298,"name":"perHostReads","values":[[1,2],null,[3,4]]},
    {"key":900,"name":"Stat_900","values":[null,7,null]}]})"));
  const Outcome over = run("trend stats --over powerOnHours --format csv --key 4 a b c d");
  EXPECT_EQ(over.out, "source,over powerOnHours,hostWrites\nb,10,40\nc,20,70\na,30,100\n");
  EXPECT_EQ(over.err, "kspdump: d: offset 0: there is no value of powerOnHours in it; it is left out\n");
  EXPECT_EQ(over.status, 1);
  // Of the ill captures one is left out; the other, more of whose records are ill than are kept, is not.
  std::string ill = record(34, {40});
  for (int i = 0; i < 102; ++i) ill += record(15, {1});
  write("e", ill);
  for (const auto& [format, finding] :
       {std::pair("table", "! d: offset 0: there is no value of powerOnHours"),
        {"chart", "! d: offset 0: there is no value of powerOnHours"},
        {"html", "<li>d: offset 0: there is no value of powerOnHours"},
        {"table", "! e: 2 further findings\n"},
        {"html", "<li>e: 2 further findings</li>"},
        {"json", R"("further_findings":2)"},
        {"json", R"({"source":"d","offset":0,"reason":"there is no value)"}}) {
    const Outcome shown = run("trend stats --over powerOnHours a d b e --format " + std::string(format));
    EXPECT_NE(shown.out.find(finding), std::string::npos) << shown.out.substr(shown.out.size() / 2);
    EXPECT_EQ(shown.err, "");
    EXPECT_EQ(shown.status, 1);
  }
  EXPECT_EQ(shell("LC_ALL=C $KSPDUMP trend stats --over powerOnHours --match hostWrites a b c").out,
            "statistics, 3 captures, 1 changed, over powerOnHours 10 to 30\n"
            "KEY  NAME        FIRST  LAST  LEAST  GREATEST  CHANGE       %  PER UNIT  TREND\n"
            "  4  hostWrites     40   100     40       100     +60  +150.0     3.000  =*@\n");
  EXPECT_EQ(run("trend stats --format csv --key 298 --key 900 a b").out,
            "source,perHostReads_0,perHostReads_1,Stat_900\na,1,2,\nb,,,7\n");
  EXPECT_EQ(run("trend stats a").status, 2);
  EXPECT_EQ(run("trend stats a missing c").status, 3);
}

TEST_F(Kspdump, SnapshotsAreSeriesInTheOrderOfTime) {
  // A ring: the oldest record stands behind the newest, and one slot is not in use yet.
  const auto at = [](uint64_t time, uint64_t hostWrites, uint64_t mediaWrites) {
    std::string bytes = interval(time);
    bytes.replace(size_t{4} * 28, 4, numbers<4>({hostWrites}));
    bytes.replace(size_t{4} * 30, 4, numbers<4>({mediaWrites}));
    return bytes;
  };
  write("ring", at(30, 4, 2) + at(40, 2, 8) + at(10, 0, 0) + at(20, 4, 4) + std::string(252, '\0'));
  EXPECT_EQ(run("snapshot --format csv --match T --match '[HN]W' --match BF ring").out,
            "record,T,HW,NW,BF_0,BF_1\n2,10,0,0,0,0\n3,20,4,4,0,0\n0,30,4,2,0,0\n1,40,2,8,0,0\n");
  EXPECT_EQ(shell("LC_ALL=C COLUMNS=60 $KSPDUMP snapshot --format chart --match T --match '[HN]W' ring").out,
            "ring: snapshot, 4 intervals\n"
            "NAME   LEAST   MEAN  GREATEST\n"
            "T         10  25.00        40  :=*@\n"
            "HW         0   2.50         4  _@@=\n"
            "NW         0   3.50         8  _=:@\n"
            "NW/HW   0.50   1.40      4.00   :.@\n");
  EXPECT_EQ(run("snapshot --format openmetrics --match HW ring").out,
            "ksp_snapshot{source=\"ring\",name=\"HW\"} 2\n# EOF\n");
  // Two words a record, the second its key, which is not shown.
  const auto field = [](uint64_t offset, const std::string& format) {
    return numbers<4>({0, offset, 4}) + format + std::string(16 - format.size(), '\0');
  };
  write("h",
        numbers<4>({0, 5, 8, 5, 0, 0, 36, 0, 0}) + numbers<4>({2, 0}) + field(4, "#=%u") + field(0, " A=%u"));
  write("keyed", numbers<4>({3, 30, 4, 40, 1, 10, 2, 20, 9, 0}));
  EXPECT_EQ(run("snapshot --header h --format openmetrics --match A keyed").out,
            "ksp_snapshot{source=\"keyed\",name=\"A\"} 4\n# EOF\n");
  std::istringstream lines(
      shell("COLUMNS=80 $KSPDUMP snapshot --format chart " KSP_EXAMPLE_CAPTURES "/day.snapshot").out);
  size_t count = 0;
  for (std::string line; std::getline(lines, line); ++count) {
    EXPECT_LE(line.size() - static_cast<size_t>(std::count_if(line.begin(), line.end(),
                                                              [](char c) { return (c & 0xC0) == 0x80; })),
              80u)
        << line;
  }
  EXPECT_GT(count, 50u);
}

TEST_F(Kspdump, OutputIsWholeOrNotThere) {
  write("a.stats", kStats);
  write("out", "before");
  EXPECT_EQ(run("stats --output out missing").status, 3);
  EXPECT_EQ(run("stats --output= out a.stats").err,
            "kspdump: --output has an empty value: --output FILE; kspdump --help tells more\n");
  EXPECT_EQ(readAll(folder_ / "out"), "before");
  fs::create_symlink("out", folder_ / "link");
  EXPECT_EQ(run("stats --format csv --output link a.stats").status, 0);
  EXPECT_EQ(readAll(folder_ / "out").substr(0, 7), "source,");
  EXPECT_TRUE(fs::is_symlink(folder_ / "link"));
  const Outcome none = run("stats --output no/such/out a.stats");
  EXPECT_EQ(none.status, 3);
  EXPECT_EQ(none.err, "kspdump: no/such/out cannot be opened: No such file or directory\n");
  EXPECT_EQ(run("stats --output /dev/full a.stats").err,
            "kspdump: /dev/full cannot be written: No space left on device\n");
  EXPECT_EQ(std::distance(fs::directory_iterator(folder_), {}), 5) << "nothing unfinished is left";
  const Outcome broken = shell("$KSPDUMP stats --format csv $(yes a.stats | head -n 5000) | head -n 1");
  EXPECT_EQ(broken.out, "source,kind,key,name,element,value\n");
  EXPECT_EQ(broken.err, "");
}

TEST_F(Kspdump, OutputNeverDestroysACapture) {
  write("a.stats", kStats);
  write("b.stats", kStats);
  write("h", "header");
  fs::create_symlink("a.stats", folder_ / "link");
  fs::create_hard_link(folder_ / "a.stats", folder_ / "hard");
  for (const char* arguments : {"stats --output a.stats a.stats", "stats --force --output link a.stats",
                                "diff stats --output hard b.stats a.stats",
                                "snapshot --header h --output h x", "stats --output a.stats - < a.stats",
                                "stats --output b.stats a.stats", "keys --output b.stats media"}) {
    const Outcome result = run(arguments);
    EXPECT_EQ(result.status, 2) << arguments;
    EXPECT_NE(result.err.find("--output"), std::string::npos) << arguments;
    EXPECT_EQ(readAll(folder_ / "a.stats"), kStats) << arguments;
    EXPECT_EQ(readAll(folder_ / "b.stats"), kStats) << arguments;
  }
  EXPECT_EQ(run("stats --force --output b.stats --format csv a.stats").status, 0);
  EXPECT_EQ(readAll(folder_ / "b.stats").substr(0, 7), "source,");
  EXPECT_EQ(run("stats --output b.stats a.stats").status, 0) << "no capture any more";
}

TEST_F(Kspdump, WrongUsageNamesTheWordsThatAreWrong) {
  const struct {
    const char* arguments;
    const char* said;
  } cases[] = {
      {"", "a command is missing; there are stats, summary, "},
      {"nonsense", "there is no command nonsense; there are stats, "},
      {"--format json stats f", "--format stands in front of the command: kspdump stats --format ..."},
      {"--format", "--format stands where a command is missing; there are stats, "},
      {"stats", "stats has no source: a file, or - for standard input"},
      {"stats ''", "a source has an empty name"},
      {"stats --format", "--format has no value: --format FORM, one of table json csv "},
      {"stats --format xml x", "--format knows no xml here, but table json csv "},
      {"stats --match= x", "--match has an empty value: --match GLOB"},
      {"snapshot --header '' x", "--header has an empty value: --header FILE"},
      {"stats --nonsense x", "there is no option --nonsense"},
      {"stats -x", "there is no option -x"},
      {"stats --numbers=1 x", "--numbers takes no value, so not --numbers=1"},
      {"stats --jobs 0 x", "--jobs takes a number from 1 to 1024"},
      {"stats --jobs 1025 x", "--jobs takes a number from 1 to 1024"},
      {"stats --key 7-3 x", "--key takes N or N-M"},
      {"stats --key 7- x", "--key takes N or N-M"},
      {"stats --max-size 4G x", "--max-size takes a number of bytes below 4G"},
      {"snapshot --jobs 2 f", "snapshot has no option --jobs, but stats, summary, media have"},
      {"snapshot a b", "snapshot takes one source, but got a, b"},
      {"diff a b",
       "a is no kind of capture that diff knows: kspdump diff KIND OLD NEW, KIND being one of stats"},
      {"diff stats a", "diff takes two captures, OLD NEW, but got a"},
      {"keys snapshot", "snapshot is no kind of capture that keys knows: "},
      {"keys stats a b", "keys takes one pattern, but got a, b"},
  };
  for (const auto& [arguments, said] : cases) {
    const Outcome result = run(arguments);
    EXPECT_EQ(result.status, 2) << arguments;
    EXPECT_EQ(result.err.substr(0, 9 + std::strlen(said)), std::string("kspdump: ") + said) << arguments;
  }
}

TEST_F(Kspdump, HelpIsToldInEightyColumnsWithItsDefaults) {
  EXPECT_EQ(run("--version").out, "kspdump " KSP_VERSION "\n");
  EXPECT_EQ(run("diff --version").out, "kspdump " KSP_VERSION "\n");
  for (const char* command : {"", "stats", "summary", "media", "snapshot", "diff", "identify", "keys"}) {
    const Outcome help = run(std::string(command) + " --help");
    EXPECT_EQ(help.status, 0) << command;
    std::istringstream lines(help.out);
    for (std::string line; std::getline(lines, line);) EXPECT_LE(line.size(), 80u) << line;
    EXPECT_TRUE(*command == '\0' || help.out.find("(default: standard output)") != std::string::npos);
    EXPECT_EQ(run(std::string(command) + " --help >/dev/full").status, 3) << command;
  }
}

TEST_F(Kspdump, RecordsAreSelectedByNameAndKey) {
  write("a.stats",
        record(4, {1}) + record(5, {2}) + record(14, {0, 1, 2, 3, 4, 5, 6, 7, 8, 9}) + record(20, {3}));
  const struct {
    const char* options;
    const char* keys;
    const char* finding;
  } cases[] = {
      {"--match 'host*'", "[4,5,14]", ""},
      {"--match 'HOST*s' --ignore-case", "[4]", ""},
      {"--match 'HOST*s'", "[]", "--match HOST*s selects nothing"},
      {"--match bandErases --match '*Dyn'", "[5,20]", ""},
      {"--key 5-14 --key 20", "[5,14,20]", ""},
      {"--key 6-13 --match hostWrites", "[4]", "--key 6-13 selects nothing"},
      {"--key 7", "[]", "--key 7 selects nothing"},
  };
  for (const auto& [options, keys, finding] : cases) {
    const Outcome result = run(std::string("stats --format json ") + options + " a.stats");
    const json document = json::parse(result.out);
    json shown = json::array();
    for (const json& each : document["records"]) shown.push_back(each["key"]);
    EXPECT_EQ(shown, json::parse(keys)) << options;
    EXPECT_EQ(document["findings"].empty() ? "" : document["findings"][0]["reason"], finding) << options;
    EXPECT_EQ(result.status, *finding == '\0' ? 0 : 1) << options;
  }
}

TEST_F(Kspdump, ExpandedArraysHaveARowAnElement) {
  write("a.stats", record(298, {1, 3}));
  const Outcome result = shell("LC_ALL=C $KSPDUMP stats --expand a.stats");
  EXPECT_EQ(result.out,
            "a.stats: statistics, 24 bytes, 1 record\n"
            "  KEY  NAME          VALUE/SUM  ELEMENTS\n"
            "  298  perHostReads          4  -@\n"
            "       [0]                   1   25.0 %  #############\n"
            "       [1]                   3   75.0 %  #######################################\n");
}

TEST_F(Kspdump, OnATerminalColumnsHoldAndFewRecordsAreExpanded) {
  write("a.media", media(4121, numbers<4>({1, 2, 3, 4, 5, 6, 7, 8, 9, 10})) + media(4096, numbers<4>({7})) +
                       media(4097, numbers<4>({7})) + media(4098, numbers<4>({7})));
  const std::string terminal = "script -qec \"stty cols 60; LC_ALL=C.UTF-8 $KSPDUMP media ";
  const Outcome four = shell(terminal + "a.media\" /dev/null");
  EXPECT_NE(four.out.find(" slipTrackingAfte…dVthInTicksHist "), std::string::npos) << four.out;
  EXPECT_EQ(four.out.find("[0]"), std::string::npos);
  EXPECT_NE(shell(terminal + "--key 4121 a.media\" /dev/null").out.find("[0]"), std::string::npos);
  EXPECT_NE(run("media a.media").out.find(" slipTrackingAfterFs1ForceFailChangedVthInTicksHist  "),
            std::string::npos);
}

TEST_F(Kspdump, KeysAndKindsAreListed) {
  EXPECT_EQ(run("keys stats 'host*Histo'").out,
            "KEY  NAME               ELEMENTS  WIDTH\n"
            " 14  hostWriteLogHisto        10      8\n"
            " 15  hostReadLogHisto         10      8\n");
  EXPECT_EQ(run("keys media --format csv fw_version_identifier").out,
            "key,name,elements,width\n16384,fw_version_identifier,1,8\n");
  EXPECT_EQ(run("keys stats --ignore-case --format json VERSION").out,
            "{\"key\":1,\"name\":\"version\",\"elements\":1,\"width\":8}\n");
  EXPECT_EQ(run("keys stats nonsense").status, 1);

  write("s", record(14, {0, 1, 2, 3, 4, 5, 6, 7, 8, 9}) + record(900, {1, 2}));
  write("m", media(4096, numbers<4>({7})));
  write("t", interval(1) + interval(2));
  write("n", "this is not a capture but a text that is quite long enough to be one");
  const Outcome result = run("identify --format json s m t n missing");
  EXPECT_EQ(result.out,
            "{\"source\":\"s\",\"kind\":\"stats\",\"recognised\":78,\"bytes\":112}\n"
            "{\"source\":\"m\",\"kind\":\"media\",\"recognised\":100,\"bytes\":8}\n"
            "{\"source\":\"t\",\"kind\":\"snapshot\",\"recognised\":100,\"bytes\":504}\n"
            "{\"source\":\"n\",\"kind\":\"unknown\",\"recognised\":0,\"bytes\":68}\n");
  EXPECT_EQ(result.status, 3);
  EXPECT_EQ(run("identify s n").status, 1);
}

TEST_F(Kspdump, NoiseIsNoSoundCapture) {
  uint64_t state = 1;
  for (size_t i = 0; i < 40; ++i) {
    std::string noise(std::vector{64U, 504U, 2520U, 65536U}[i % 4], '\0');
    for (char& c : noise)
      c = static_cast<char>((state = state * 6364136223846793005 + 1442695040888963407) >> 56);
    write(std::to_string(i), noise);
  }
  for (const char* command :
       {"40 $KSPDUMP stats", "40 $KSPDUMP summary", "40 $KSPDUMP media", "1 $KSPDUMP snapshot"}) {
    const std::string found = "\n" + shell("ls | xargs -n " + std::string(command) + " --format csv").err;
    for (size_t i = 0; i < 40; ++i)
      EXPECT_NE(found.find("\nkspdump: " + std::to_string(i) + ": "), found.npos) << command << i;
  }
}

TEST_F(Kspdump, NamesStandForThemselves) {
  for (const std::string name : {"[a]", "[a,b]", "++", "--help"}) {
    write(name, record(4, {1}));
    const Outcome result = run("stats --format json -- " + name);
    EXPECT_EQ(json::parse(result.out)["source"], name);
    if (name != "--help") {
      EXPECT_EQ(run("stats --format json " + name).out, result.out);
    }
  }
  write("\xC3\xA4\xFF\x9B", "");
  const Outcome named = shell("LC_ALL=C.UTF-8 $KSPDUMP stats --format json *'\xFF'*");
  EXPECT_EQ(json::parse(named.out)["source"], "\xC3\xA4\\xff\\x9b");
}

TEST_F(Kspdump, NamesCannotSteerTheTerminal) {
  write("a\x1b[2J\n.stats", "");
  EXPECT_EQ(run("stats --format csv a*").err,
            "kspdump: a\\x1b[2J\\x0a.stats: offset 0: the capture is empty\n");
}

TEST_F(Kspdump, ExamplesAreWhatTheirGeneratorMakes) {
  ASSERT_EQ(shell(KSP_CAPTURE_GENERATOR " .").status, 0);
  int examples = 0;
  for (const auto& file : fs::directory_iterator(KSP_EXAMPLE_CAPTURES)) {
    if (file.path().extension() == ".cpp") continue;
    EXPECT_EQ(readAll(folder_ / file.path().filename()), readAll(file)) << file;
    ++examples;
  }
  EXPECT_EQ(examples, 6);
  const Outcome all = run("stats monday.stats tuesday.stats");
  EXPECT_EQ(all.status, 0) << all.err;
  EXPECT_EQ(run("media monday.media tuesday.media").status, 0);
  EXPECT_EQ(run("snapshot --header day.header day.snapshot").status, 0);
}

}  // namespace
