#include "net/config_utils.h"

#include <string>
#include <vector>

#include <android-base/file.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

using ::testing::ElementsAre;

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

  // Every entry as key=value, in key order.
  static std::vector<std::string> Pairs(ConfigUtils& store) {
    std::vector<std::string> pairs;
    for (auto it = store.GetIterator(); it != store.GetEnd(); ++it) {
      pairs.push_back(it->first + "=" + it->second);
    }
    return pairs;
  }

  std::vector<std::string> Keys(bool restart_first) {
    std::vector<std::string> keys;
    for (const char* key = store_.GetNext(restart_first); key; key = store_.GetNext(false)) {
      keys.emplace_back(key);
    }
    return keys;
  }

  // The store's lines at |severity|, in order.
  std::vector<std::string> Lines(android::base::LogSeverity severity) {
    std::vector<std::string> lines;
    for (const LogCapture::Entry& entry : log_.Entries()) {
      if (entry.severity == severity && entry.tag == kTag) lines.push_back(entry.message);
    }
    return lines;
  }

  static constexpr char kTag[] = "dalix.uwb.CongifUtils";
  LogCapture log_;
  TemporaryDir dir_;
  ConfigUtils store_;
};

TEST_F(ConfigUtilsTest, ParsesLinesByTheFileRulesWhateverTheBytes) {
  const std::string long_value(1 << 20, 'v');
  const struct {
    std::string text;
    std::vector<std::string> expected;
  } cases[] = {
      // Comments, equals signs, a later line winning, case, and no final newline.
      {"a=1\nb = 2 ; x\nc = 3#x=2\n# d=4\ne;=5\nf=\ng= \nh = b = c\nwords\n\n=v\nk=1\nk=2\nK=0",
       {"=v", "K=0", "a=1", "b=2", "c=3", "g=", "h=b = c", "k=2"}},
      // A CR stays on the line, so an equals before it is not the last character.
      {"a=1\r\nb=\r\nc=;\n\t my key \t=\t a  b \t\n", {"a=1", "b=", "c=", "my key=a  b"}},
      // Only blank and control whitespace is trimmed, and only at the ends.
      {"\v\x01k\x0e\f=\x01v\x0e\f\n", {"\x01k\x0e=\x01v\x0e"}},
      // No line is cut in two, however long.
      {"key=" + long_value + "\nafter=1\n", {"after=1", "key=" + long_value}},
      {"", {}},
  };
  for (const auto& c : cases) {
    ConfigUtils store;
    ASSERT_TRUE(store.Load(WriteFile("c.conf", c.text).c_str())) << c.text.substr(0, 40);
    EXPECT_EQ(c.expected, Pairs(store)) << c.text.substr(0, 40);
  }

  // A directory opens but reads nothing; a NUL inside a line is part of it.
  EXPECT_TRUE(store_.Load(dir_.path));
  EXPECT_TRUE(store_.IsEmpty());
  ASSERT_TRUE(store_.Load(WriteFile("nul.conf", std::string("a=1\0b=2\n", 8)).c_str()));
  const std::string saved = WriteFile("nul.out", "");
  ASSERT_TRUE(store_.Save(saved.c_str()));
  EXPECT_EQ(std::string("a = 1\0b=2", 9), ReadFile(saved));
}

TEST_F(ConfigUtilsTest, LoadsMergeBadCallsChangeNothingAndSaveAndDumpGoInKeyOrder) {
  ASSERT_TRUE(store_.Load(WriteFile("one.conf", "a=1\nb=2\n").c_str()));
  ASSERT_TRUE(store_.Load(WriteFile("two.conf", "b=20\nc=30\n").c_str()));
  EXPECT_TRUE(store_.Set(" k ", " v "));
  const std::string missing = std::string(dir_.path) + "/missing.conf";
  const std::string unwritable = std::string(dir_.path) + "/no/such/dir.conf";
  EXPECT_FALSE(store_.Load(missing.c_str()));
  EXPECT_FALSE(store_.Load(nullptr));
  EXPECT_FALSE(store_.Save(nullptr));
  EXPECT_FALSE(store_.Save(unwritable.c_str()));
  EXPECT_EQ(nullptr, store_.GetValue(nullptr));
  EXPECT_FALSE(store_.Set(nullptr, "v"));
  EXPECT_FALSE(store_.Set("k", nullptr));
  EXPECT_THAT(Lines(android::base::ERROR),
              ElementsAre("Load Cannot open file: " + missing, "Load Bad argument",
                          "Save Bad argument", "Save Cannot open file: " + unwritable,
                          "GetValue Bad argument", "Set Bad argument", "Set Bad argument"));
  EXPECT_EQ((std::vector<std::string>{" k = v ", "a=1", "b=20", "c=30"}), Pairs(store_));

  const std::string path = WriteFile("out.conf", "old contents, longer than the new ones");
  ASSERT_TRUE(store_.Save(path.c_str()));
  EXPECT_EQ(" k  =  v a = 1b = 20c = 30", ReadFile(path));
  store_.Dump();
  EXPECT_THAT(Lines(android::base::INFO),
              ElementsAre("Dump  k = v ", "Dump a=1", "Dump b=20", "Dump c=30"));
}

TEST_F(ConfigUtilsTest, GetNextFollowsItsCursorRules) {
  // Fresh store: nothing placed the cursor yet.
  EXPECT_EQ(nullptr, store_.GetNext(false));

  store_.Load(WriteFile("k.conf", "b=2\na=1\nc=3\n").c_str());
  EXPECT_EQ((std::vector<std::string>{"a", "b", "c"}), Keys(true));
  // The null that ended the walk rewound it.
  EXPECT_EQ((std::vector<std::string>{"a", "b", "c"}), Keys(false));

  // Set places the cursor on the first entry, mid-walk or not.
  EXPECT_STREQ("a", store_.GetNext(true));
  store_.Set("0", "zero");
  EXPECT_EQ((std::vector<std::string>{"0", "a", "b", "c"}), Keys(false));
  EXPECT_TRUE(log_.Contains(android::base::INFO, "GetNext 0=zero", kTag));

  // Clear empties the store and leaves the cursor alone; the walk must start
  // again with restart.
  store_.Clear();
  store_.Load(WriteFile("x.conf", "x=1\n").c_str());
  EXPECT_EQ(nullptr, store_.GetNext(false));
  EXPECT_EQ((std::vector<std::string>{"x"}), Keys(true));
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
