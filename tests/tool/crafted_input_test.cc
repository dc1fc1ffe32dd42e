// A small binary property list that references one large string 20,000 times
// would expand to gigabytes; every reader refuses it, and the programs go on.
#include <gtest/gtest.h>

#include "plist/property_list.h"
#include "support/run_program.h"

using namespace qr;

namespace {

std::string bigEndian(uint64_t v, size_t n) {
  std::string out(n, '\0');
  for (size_t i = n; i-- > 0; v >>= 8) out[i] = static_cast<char>(v & 0xFF);
  return out;
}

// { "k": [s, s, ... 20,000 times] } with s one string of 100,000 bytes.
std::string fanOutFile() {
  std::string dict = std::string("\xD1", 1) + bigEndian(1, 4) + bigEndian(2, 4);
  std::string key = "\x51k";
  std::string array = std::string("\xAF\x11", 2) + bigEndian(20000, 2);
  for (int i = 0; i < 20000; ++i) array += bigEndian(3, 4);
  std::string text = std::string("\x5F\x12", 2) + bigEndian(100000, 4) + std::string(100000, 'x');
  std::string file = "bplist00", table;
  for (const std::string* o : {&dict, &key, &array, &text}) {
    table += bigEndian(file.size(), 4);
    file += *o;
  }
  uint64_t tableOffset = file.size();
  return file + table + std::string(6, '\0') + "\x04\x04" + bigEndian(4, 8) + bigEndian(0, 8) +
         bigEndian(tableOffset, 8);
}

TEST(CraftedInput, AFanOutFileIsRefusedEverywhere) {
  const std::string file = fanOutFile();
  for (auto m : {Mutability::Immutable, Mutability::MutableContainers,
                 Mutability::MutableContainersAndLeaves})
    EXPECT_FALSE(readPropertyList(file, m)) << static_cast<int>(m);

  qrtest::TempDir dir;
  qrtest::ProgramOptions o;
  o.args = {"--dict", dir.write("fan.plist", file), dir.write("ok.plist", "{ MFG = ACME; }")};
  auto dict = qrtest::runProgram(QUARRIN_BINARY_DIR "/src/pmdeviceid", o);
  EXPECT_EQ(dict.status, 2) << dict.err;
  EXPECT_NE(dict.err.find("fan.plist"), std::string::npos) << dict.err;
  EXPECT_NE(dict.out.find("ACME"), std::string::npos) << dict.out;

  o.args = {"-s"};
  o.env = {{"CACHEWRIGHT_FRAMEWORK", dir / "none"}, {"CACHEWRIGHT_PREFS", dir / "prefs.plist"}};
  o.input = file;
  auto stream = qrtest::runProgram(QUARRIN_BINARY_DIR "/src/cachewright", o);
  EXPECT_EQ(stream.status, 0) << stream.err;
  EXPECT_LT(stream.out.size(), 1000u);
}

}  // namespace
