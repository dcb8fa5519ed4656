#include "net/config_utils.h"

#include <string>
#include <vector>

#include <android-base/file.h>
#include <gtest/gtest.h>

#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

using Map = ConfigUtils::Map;

class ConfigUtilsTest : public ::testing::Test {
 protected:
  std::string WriteFile(const std::string& name, const std::string& text) {
    std::string path = std::string(dir_.path) + "/" + name;
    EXPECT_TRUE(android::base::WriteStringToFile(text, path));
    return path;
  }

  std::string ReadFile(const std::string& path) {
    std::string text;
    EXPECT_TRUE(android::base::ReadFileToString(path, &text));
    return text;
  }

  static Map Contents(ConfigUtils& store) { return Map(store.GetIterator(), store.GetEnd()); }

  std::vector<std::string> Keys(bool restart_first) {
    std::vector<std::string> keys;
    for (const char* key = store_.GetNext(restart_first); key; key = store_.GetNext(false)) {
      keys.emplace_back(key);
    }
    return keys;
  }

  TemporaryDir dir_;
  ConfigUtils store_;
};

TEST_F(ConfigUtilsTest, ParsesLinesByTheFileRules) {
  const struct {
    const char* what;
    std::string text;
    Map expected;
  } cases[] = {
      {"plain pairs", "a=1\nb = 2\n", {{"a", "1"}, {"b", "2"}}},
      {"comment after value", "a=1 ; x\n", {{"a", "1"}}},
      {"hash comment after value", "a = 1#x=2\n", {{"a", "1"}}},
      {"whole-line comment", "# a=1\n", {}},
      {"comment before equals", "a;=1\n", {}},
      {"equals last on line", "a=\n", {}},
      {"blank after equals", "a= \n", {{"a", ""}}},
      {"value holds equals", "a = b = c\n", {{"a", "b = c"}}},
      {"no equals", "just words\n\n", {}},
      {"empty key", "=v\n", {{"", "v"}}},
      {"later line wins", "k=1\nk=2\n", {{"k", "2"}}},
      {"keys are case-sensitive", "K=1\nk=2\n", {{"K", "1"}, {"k", "2"}}},
      {"inner blanks kept", "\t my key \t=\t a  b \t\n", {{"my key", "a  b"}}},
      {"CR LF line ends", "a=1\r\nb=2\r\n", {{"a", "1"}, {"b", "2"}}},
      {"no final newline", "a=1\nb=2", {{"a", "1"}, {"b", "2"}}},
      {"CR before LF after equals", "a=\r\n", {{"a", ""}}},
      {"comment right after equals", "a=;\n", {{"a", ""}}},
      // Only blank and control whitespace is trimmed, and only at the ends.
      {"control characters", "\v\x01k\x0e\f=\x01v\x0e\f\n", {{"\x01k\x0e", "\x01v\x0e"}}},
      {"empty file", "", {}},
  };
  for (const auto& c : cases) {
    ConfigUtils store;
    ASSERT_TRUE(store.Load(WriteFile("c.conf", c.text).c_str())) << c.what;
    EXPECT_EQ(c.expected, Contents(store)) << c.what;
  }
}

TEST_F(ConfigUtilsTest, HostileFilesLoadWithoutHarm) {
  // Arbitrary bytes are the config fuzzer's; a line longer than any buffer
  // must still not be cut in two.
  std::string long_value(1 << 20, 'v');
  ASSERT_TRUE(store_.Load(WriteFile("long.conf", "key=" + long_value + "\nafter=1\n").c_str()));
  EXPECT_EQ(long_value, store_.GetValue("key"));
  EXPECT_STREQ("1", store_.GetValue("after"));

  // A NUL inside a line is part of it, not its end.
  ConfigUtils nul_store;
  EXPECT_TRUE(nul_store.Load(WriteFile("nul.conf", std::string("a=1\0b=2\n", 8)).c_str()));
  EXPECT_EQ((Map{{"a", std::string("1\0b=2", 5)}}), Contents(nul_store));
  const std::string saved = std::string(dir_.path) + "/nul.out";
  ASSERT_TRUE(nul_store.Save(saved.c_str()));
  EXPECT_EQ(std::string("a = 1\0b=2", 9), ReadFile(saved));

  // A directory opens but reads nothing.
  ConfigUtils dir_store;
  EXPECT_TRUE(dir_store.Load(dir_.path));
  EXPECT_TRUE(dir_store.IsEmpty());
}

TEST_F(ConfigUtilsTest, UnreadablePathsAreRefusedWithTheirLogLines) {
  LogCapture log;
  const std::string missing = std::string(dir_.path) + "/missing.conf";
  EXPECT_FALSE(store_.Load(missing.c_str()));
  EXPECT_FALSE(store_.Load(nullptr));
  EXPECT_FALSE(store_.Save(nullptr));
  const std::string unwritable = std::string(dir_.path) + "/no/such/dir.conf";
  EXPECT_FALSE(store_.Save(unwritable.c_str()));
  EXPECT_EQ(nullptr, store_.GetValue(nullptr));
  EXPECT_FALSE(store_.Set(nullptr, "v"));
  EXPECT_FALSE(store_.Set("k", nullptr));
  EXPECT_TRUE(store_.IsEmpty());

  const char* tag = "dalix.uwb.CongifUtils";
  EXPECT_TRUE(log.Contains(android::base::ERROR, "Load Cannot open file: " + missing, tag));
  EXPECT_TRUE(log.Contains(android::base::ERROR, "Load Bad argument", tag));
  EXPECT_TRUE(log.Contains(android::base::ERROR, "Save Bad argument", tag));
  EXPECT_TRUE(log.Contains(android::base::ERROR, "Save Cannot open file: " + unwritable, tag));
  EXPECT_TRUE(log.Contains(android::base::ERROR, "GetValue Bad argument", tag));
  EXPECT_EQ(2, log.Count(android::base::ERROR, "Set Bad argument", tag)) << log.Text();
}

TEST_F(ConfigUtilsTest, LoadsMergeSetKeepsBlanksAndSaveAndDumpGoInKeyOrder) {
  ASSERT_TRUE(store_.Load(WriteFile("one.conf", "a=1\nb=2\n").c_str()));
  ASSERT_TRUE(store_.Load(WriteFile("two.conf", "b=20\nc=30\n").c_str()));
  EXPECT_FALSE(store_.Load("/nonexistent/dir/x.conf"));
  EXPECT_TRUE(store_.Set(" k ", " v "));
  EXPECT_EQ((Map{{" k ", " v "}, {"a", "1"}, {"b", "20"}, {"c", "30"}}), Contents(store_));
  EXPECT_EQ(nullptr, store_.GetValue("k"));

  const std::string path = WriteFile("out.conf", "old contents, longer than the new ones");
  ASSERT_TRUE(store_.Save(path.c_str()));
  EXPECT_EQ(" k  =  v a = 1b = 20c = 30", ReadFile(path));
  LogCapture log;
  store_.Dump();
  std::vector<std::string> dumped;
  for (const auto& entry : log.Entries()) {
    if (entry.message.rfind("Dump", 0) == 0) {
      EXPECT_EQ(android::base::INFO, entry.severity);
      EXPECT_EQ("dalix.uwb.CongifUtils", entry.tag);
      dumped.push_back(entry.message);
    }
  }
  EXPECT_EQ((std::vector<std::string>{"Dump  k = v ", "Dump a=1", "Dump b=20", "Dump c=30"}),
            dumped);
  store_.Clear();
  ASSERT_TRUE(store_.Save(path.c_str()));
  EXPECT_EQ("", ReadFile(path));
}

TEST_F(ConfigUtilsTest, GetNextFollowsItsCursorRules) {
  // Fresh store: nothing placed the cursor yet.
  EXPECT_EQ(nullptr, store_.GetNext(false));
  EXPECT_EQ(nullptr, store_.GetNext(true));
  EXPECT_EQ(nullptr, store_.GetNext(false));

  store_.Load(WriteFile("k.conf", "b=2\na=1\nc=3\n").c_str());
  EXPECT_EQ((std::vector<std::string>{"a", "b", "c"}), Keys(true));
  // The null that ended the walk rewound it.
  EXPECT_EQ((std::vector<std::string>{"a", "b", "c"}), Keys(false));

  // Set places the cursor on the first entry, mid-walk or not.
  EXPECT_STREQ("a", store_.GetNext(true));
  EXPECT_STREQ("b", store_.GetNext(false));
  store_.Set("0", "zero");
  EXPECT_EQ((std::vector<std::string>{"0", "a", "b", "c"}), Keys(false));

  LogCapture log;
  EXPECT_STREQ("0", store_.GetNext(true));
  EXPECT_TRUE(log.Contains(android::base::INFO, "GetNext 0=zero", "dalix.uwb.CongifUtils"));

  // Clear leaves the cursor alone; the walk must start again with restart.
  store_.Clear();
  EXPECT_TRUE(store_.IsEmpty());
  store_.Load(WriteFile("x.conf", "x=1\n").c_str());
  EXPECT_EQ(nullptr, store_.GetNext(false));
  EXPECT_EQ((std::vector<std::string>{"x"}), Keys(true));
  store_.Clear();
  EXPECT_EQ(nullptr, store_.GetNext(true));
  EXPECT_EQ(nullptr, store_.GetNext(false));
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
