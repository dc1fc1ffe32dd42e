// pmdeviceid: its JSON records, in process, and the built program from outside.
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>

#include "device_id_test_support.h"
#include "deviceid/device_id_json.h"
#include "deviceid/pmdeviceid_tool.h"
#include "platform/boolean.h"
#include "platform/data.h"
#include "platform/date.h"
#include "platform/dictionary.h"
#include "platform/number.h"

using namespace deviceid_test;
using qr::deviceid::deviceDictionaryRecord;
using qr::deviceid::deviceIDRecord;

namespace {

struct ToolRun {
  int status;
  std::string out, err;
};

ToolRun runInProcess(std::vector<std::string> args, const std::string& input = "") {
  std::istringstream in(input);
  std::ostringstream out, err;
  int status = qr::deviceid::runPMDeviceID(args, in, out, err);
  return {status, out.str(), err.str()};
}

std::string quoted(const std::string& arg) {
  std::string q = "'";
  for (char c : arg) q += c == '\'' ? std::string("'\\''") : std::string(1, c);
  return q + "'";
}

// Runs the built program through the shell with the given standard input.
ToolRun runProgram(const std::vector<std::string>& args, const std::string& input = "") {
  namespace fs = std::filesystem;
  fs::path dir = fs::temp_directory_path() / ("pmdeviceid-test-" + std::to_string(getpid()));
  fs::create_directories(dir);
  std::ofstream(dir / "in", std::ios::binary) << input;
  std::string command = quoted(QUARRIN_BINARY_DIR "/src/pmdeviceid");
  for (const auto& a : args) command += " " + quoted(a);
  command += " <" + quoted(dir / "in") + " >" + quoted(dir / "out") + " 2>" + quoted(dir / "err");
  int raw = std::system(command.c_str());
  auto slurp = [](const fs::path& p) {
    std::ifstream f(p, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(f), {});
  };
  ToolRun r{WIFEXITED(raw) ? WEXITSTATUS(raw) : -1, slurp(dir / "out"), slurp(dir / "err")};
  fs::remove_all(dir);
  return r;
}

}  // namespace

TEST(PMDeviceIDRecords, DeviceIDStringKeysInOrder) {
  EXPECT_EQ(
      deviceIDRecord(*S("MFG:HP;MDL:LaserJet 4000;CMD:PJL,PCL,POSTSCRIPT;")),
      R"j({"input":"MFG:HP;MDL:LaserJet 4000;CMD:PJL,PCL,POSTSCRIPT;","make":"HP",)j"
      R"j("model":"LaserJet 4000","commandSet":"PJL,PCL,POSTSCRIPT","compatibleIDs":null,)j"
      R"j("serialNumber":null,"product":"(HP LaserJet 4000)","deviceName":"HP LaserJet 4000",)j"
      R"j("softwareUpdateScaneID":"MANUFACTURER:HP;MODEL:LaserJet 4000","supportsPCL":true,)j"
      R"j("supportsPostscript":true,"dictionaryValue":{"mfg":"HP","mdl":"LaserJet 4000",)j"
      R"j("cmd":"PJL,PCL,POSTSCRIPT","":""}})j");
  EXPECT_EQ(deviceIDRecord(*S("")),
            R"j({"input":"","make":null,"model":null,"commandSet":null,"compatibleIDs":null,)j"
            R"j("serialNumber":null,"product":"","deviceName":"Unknown",)j"
            R"j("softwareUpdateScaneID":null,"supportsPCL":false,"supportsPostscript":true,)j"
            R"j("dictionaryValue":null})j");
}

TEST(PMDeviceIDRecords, StringsAreEscapedAndAlwaysValidUTF8) {
  std::string out;
  qr::deviceid::appendJSONString(out, *S("q\"b\\n\n\t\x01\x7F\xC3\xA9\xF0\x9F\x96\xA8"));
  EXPECT_EQ(out, "\"q\\\"b\\\\n\\n\\t\\u0001\x7F\xC3\xA9\xF0\x9F\x96\xA8\"");
  out.clear();
  qr::deviceid::appendJSONString(out, *qr::String::fromUTF16(u"a\xDC00"));
  EXPECT_EQ(out, "\"a\xEF\xBF\xBD\"");
}

TEST(PMDeviceIDRecords, DictionaryRecordPrintsValuesInTheirJSONForm) {
  auto d = qr::make<qr::MutableDictionary>();
  d->set("MFG", S("Acme"));
  d->set("MDL", qr::Number::integer(-12));
  d->set("CMD", qr::Boolean::trueValue());
  d->set("SN", qr::Data::copy(std::string_view("\x00\xFF\x10\x20", 4)));
  d->set("CID", qr::Date::fromUnixTime(0));
  EXPECT_EQ(
      deviceDictionaryRecord(*d),
      R"j({"make":"Acme","model":-12,"commandSet":true,"compatibleIDs":"1970-01-01T00:00:00Z",)j"
      R"j("serialNumber":"AP8QIA==","product":"(Acme -12)",)j"
      R"j("softwareUpdateScaneID":"MANUFACTURER:Acme;MODEL:-12","supportsPCL":false,)j"
      R"j("supportsPostscript":false,"stringValue":"MFG:Acme;MDL:-12;CMD:true;SN:<00ff1020>;)j"
      R"j(CID:1970-01-01T00:00:00Z"})j");
  auto empty = qr::make<qr::MutableDictionary>();
  EXPECT_EQ(
      deviceDictionaryRecord(*empty),
      R"j({"make":null,"model":null,"commandSet":null,"compatibleIDs":null,)j"
      R"j("serialNumber":null,"product":"","softwareUpdateScaneID":null,"supportsPCL":false,)j"
      R"j("supportsPostscript":true,"stringValue":""})j");
}

TEST(PMDeviceIDRecords, NestedAndUnusualValues) {
  std::string out;
  auto inner = qr::make<qr::MutableDictionary>();
  inner->set("r", qr::Number::real(0.1));
  inner->set(qr::Number::integer(3), qr::Number::unsignedInteger(UINT64_MAX));
  auto list = qr::make<qr::MutableArray>();
  list->append(inner);
  list->append(qr::Number::real(NAN));
  list->append(qr::Data::copy(std::string_view("ab")));
  qr::deviceid::appendJSONValue(out, list.get());
  EXPECT_EQ(out, R"j([{"r":0.1,"3":18446744073709551615},"nan","YWI="])j");
  out.clear();
  // Nesting beyond the property-list bound prints as null instead of recursing on.
  qr::Ref<qr::Object> deep = S("x");
  for (int i = 0; i < 600; ++i) {
    auto a = qr::make<qr::MutableArray>();
    a->append(deep);
    deep = a;
  }
  qr::deviceid::appendJSONValue(out, deep.get());
  EXPECT_NE(out.find("null"), std::string::npos);
  EXPECT_EQ(out.find("\"x\""), std::string::npos);
}

TEST(PMDeviceIDTool, StandardInputLinesAndArguments) {
  ToolRun r = runInProcess({}, "MFG:A\r\n\nMDL:B");
  EXPECT_EQ(r.status, 0);
  std::istringstream lines(r.out);
  std::string first, second, third, none;
  std::getline(lines, first);
  std::getline(lines, second);
  std::getline(lines, third);
  EXPECT_FALSE(std::getline(lines, none));
  EXPECT_TRUE(first.starts_with(R"j({"input":"MFG:A","make":"A","mod)j"))
      << first << "carriage return dropped";
  EXPECT_TRUE(second.starts_with(R"j({"input":"",)j")) << second;
  EXPECT_TRUE(third.starts_with(R"j({"input":"MDL:B")j")) << third;
  ToolRun args = runInProcess({"MFG:X", "MFG:Y"}, "MFG:ignored\n");
  EXPECT_EQ(args.out.find("ignored"), std::string::npos);
  EXPECT_NE(args.out.find(R"j("make":"Y")j"), std::string::npos);
  ToolRun dashes = runInProcess({"--", "--dict"});
  EXPECT_EQ(dashes.status, 0);
  EXPECT_TRUE(dashes.out.starts_with(R"j({"input":"--dict",)j")) << dashes.out;
}

TEST(PMDeviceIDTool, UnreadableInputIsReportedAndTheRestStillRuns) {
  ToolRun r = runInProcess({}, "MFG:A\n\xC0\xAF\nMFG:B\n");
  EXPECT_EQ(r.status, 2);
  EXPECT_EQ(r.err, "pmdeviceid: standard input, line 2: not valid UTF-8\n");
  EXPECT_NE(r.out.find(R"j("make":"B")j"), std::string::npos);
  ToolRun e = runInProcess({"--escape", "iso-latin-1", "caf\xC3\xA9", "\xE2\x82\xAC", "a b"});
  EXPECT_EQ(e.status, 2);
  EXPECT_EQ(e.out, "caf%E9\n\na%20b\n");
  EXPECT_EQ(e.err, "pmdeviceid: argument 2: cannot be written in iso-latin-1\n");
}

TEST(PMDeviceIDTool, UsageErrors) {
  for (auto args : std::vector<std::vector<std::string>>{
           {"--escape"}, {"--escape", "no-such-encoding", "x"}, {"--escape", ""}, {"--frob"}}) {
    ToolRun r = runInProcess(args);
    EXPECT_EQ(r.status, 1);
    EXPECT_TRUE(r.out.empty());
    EXPECT_NE(r.err.find("usage: pmdeviceid"), std::string::npos);
  }
}

TEST(PMDeviceIDTool, EscapeAcceptsOurNamesAndICUNames) {
  EXPECT_EQ(runInProcess({"--escape", "UTF-16", "a b"}).out, "a%00%20b\n");
  EXPECT_EQ(runInProcess({"--escape", "windows-1252", "\xE2\x82\xAC"}).out, "%80\n");
  EXPECT_EQ(runInProcess({"--escape", "ascii"}, "a/b\r\nc d\n").out, "a%2Fb\nc%20d\n");
  EXPECT_EQ(runInProcess({"--escape", "Shift_JIS", "\xE6\x97\xA5"}).out, "%93%FA\n");
}

TEST(PMDeviceIDTool, DictionaryInputThatIsNotADictionary) {
  ToolRun missing = runInProcess({"--dict", "/nonexistent/device.plist"});
  EXPECT_EQ(missing.status, 2);
  EXPECT_EQ(missing.err, "pmdeviceid: /nonexistent/device.plist: cannot be read\n");
  ToolRun garbage = runInProcess({"--dict"}, "\x01\x02 not a property list");
  EXPECT_EQ(garbage.status, 2);
  EXPECT_NE(garbage.err.find("pmdeviceid: standard input: "), std::string::npos);
  EXPECT_TRUE(garbage.out.empty());
}

TEST(PMDeviceIDProgram, RunsAsBuiltWithItsExitStatuses) {
  ToolRun ok = runProgram({"MFG:hp;MDL:HP LaserJet"});
  EXPECT_EQ(ok.status, 0);
  EXPECT_NE(ok.out.find(R"j("deviceName":"HP LaserJet","softwareUpdateScaneID":)j"
                        R"j("MANUFACTURER:hp;MODEL:HP LaserJet")j"),
            std::string::npos);
  EXPECT_EQ(ok.out.back(), '\n');
  ToolRun piped = runProgram({}, "DES:Office printer\n\xFF\nMFG:Z\n");
  EXPECT_EQ(piped.status, 2);
  EXPECT_EQ(std::count(piped.out.begin(), piped.out.end(), '\n'), 2);
  EXPECT_NE(piped.err.find("line 2"), std::string::npos);
  ToolRun usage = runProgram({"--escape"});
  EXPECT_EQ(usage.status, 1);
  EXPECT_NE(usage.err.find("usage:"), std::string::npos);
  ToolRun escape = runProgram({"--escape", "utf-8", "a b/c"});
  EXPECT_EQ(escape.status, 0);
  EXPECT_EQ(escape.out, "a%20b%2Fc\n");
}

TEST(PMDeviceIDProgram, DictionariesFromXMLPropertyListFiles) {
  namespace fs = std::filesystem;
  fs::path dir = fs::temp_directory_path() / ("pmdeviceid-dict-" + std::to_string(getpid()));
  fs::create_directories(dir);
  const char* header =
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
      "<!DOCTYPE plist PUBLIC \"-//Apple//DTD PLIST 1.0//EN\" "
      "\"http://www.apple.com/DTDs/PropertyList-1.0.dtd\">\n<plist version=\"1.0\">\n";
  std::ofstream(dir / "device.plist") << header
                                      << "<dict>\n"
                                         "\t<key>MFG</key><string>Hewlett-Packard</string>\n"
                                         "\t<key>MDL</key><string>HP LaserJet 4000</string>\n"
                                         "\t<key>pdl</key><string>application/postscript</string>\n"
                                         "\t<key>SN</key><integer>1234</integer>\n"
                                         "\t<key>CID</key><data>AP8=</data>\n"
                                         "</dict>\n</plist>\n";
  std::ofstream(dir / "list.plist") << header << "<array><string>MFG</string></array></plist>\n";
  std::ofstream(dir / "broken.plist") << header << "<dict><key>MFG</key></plist>\n";
  ToolRun r = runProgram({"--dict", dir / "device.plist", dir / "list.plist", dir / "broken.plist",
                          dir / "missing.plist"});
  EXPECT_EQ(r.status, 2);
  EXPECT_EQ(
      r.out,
      R"j({"make":"Hewlett-Packard","model":"HP LaserJet 4000","commandSet":"application/postscript",)j"
      R"j("compatibleIDs":"AP8=","serialNumber":1234,"product":"(HP LaserJet 4000)",)j"
      R"j("softwareUpdateScaneID":"MANUFACTURER:Hewlett-Packard;MODEL:HP LaserJet 4000",)j"
      R"j("supportsPCL":false,"supportsPostscript":true,)j"
      R"j("stringValue":"MFG:Hewlett-Packard;MDL:HP LaserJet 4000;pdl:application/postscript;)j"
      R"j(SN:1234;CID:<00ff>"})j"
      "\n");
  EXPECT_NE(r.err.find((dir / "list.plist").string() + ": the property list is not a dictionary"),
            std::string::npos);
  EXPECT_NE(r.err.find((dir / "broken.plist").string() + ": not a property list"),
            std::string::npos);
  EXPECT_NE(r.err.find((dir / "missing.plist").string() + ": cannot be read"), std::string::npos);
  // One property list on standard input.
  ToolRun piped =
      runProgram({"--dict"}, std::string(header) +
                                 "<dict><key>product</key><string>(deskjet 990c)</string>"
                                 "</dict></plist>\n");
  EXPECT_EQ(piped.status, 0);
  EXPECT_TRUE(piped.out.starts_with(R"j({"make":"hp","model":"deskjet 990c",)j")) << piped.out;
  EXPECT_TRUE(piped.err.empty()) << piped.err;
  fs::remove_all(dir);
}
