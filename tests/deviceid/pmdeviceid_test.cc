// pmdeviceid: its JSON records, in process, and the built program from outside.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <sstream>

#include "device_id_test_support.h"
#include "deviceid/device_id_json.h"
#include "deviceid/pmdeviceid_tool.h"
#include "support/run_program.h"
#include "support/temp_dir.h"
#include "values/boolean.h"
#include "values/data.h"
#include "values/date.h"
#include "values/dictionary.h"
#include "values/number.h"

using namespace deviceid_test;
using qr::deviceid::deviceDictionaryRecord;
using qr::deviceid::deviceIDRecord;

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
  EXPECT_EQ(
      deviceDictionaryRecord(*qr::make<qr::MutableDictionary>()),
      R"j({"make":null,"model":null,"commandSet":null,"compatibleIDs":null,)j"
      R"j("serialNumber":null,"product":"","softwareUpdateScaneID":null,"supportsPCL":false,)j"
      R"j("supportsPostscript":true,"stringValue":""})j");
}

TEST(PMDeviceIDRecords, EscapedAlwaysValidUTF8AndNestedValues) {
  auto json = [](const qr::Object* value) {
    std::string out;
    qr::deviceid::appendJSONValue(out, value);
    return out;
  };
  EXPECT_EQ(json(S("q\"b\\n\n\t\x01\x7F\xC3\xA9\xF0\x9F\x96\xA8").get()),
            "\"q\\\"b\\\\n\\n\\t\\u0001\x7F\xC3\xA9\xF0\x9F\x96\xA8\"");
  EXPECT_EQ(json(qr::String::fromUTF16(u"a\xDC00").get()), "\"a\xEF\xBF\xBD\"");
  auto inner = qr::make<qr::MutableDictionary>();
  inner->set("r", qr::Number::real(0.1));
  inner->set(qr::Number::integer(3), qr::Number::unsignedInteger(UINT64_MAX));
  auto list = qr::make<qr::MutableArray>();
  list->append(inner);
  list->append(qr::Number::real(NAN));
  list->append(qr::Data::copy(std::string_view("ab")));
  EXPECT_EQ(json(list.get()), R"j([{"r":0.1,"3":18446744073709551615},"nan","YWI="])j");
  // Nesting beyond the property-list bound prints as null instead of recursing on.
  qr::Ref<qr::Object> deep = S("x");
  for (int i = 0; i < 600; ++i) {
    auto a = qr::make<qr::MutableArray>();
    a->append(deep);
    deep = a;
  }
  EXPECT_NE(json(deep.get()).find("null"), std::string::npos);
  EXPECT_EQ(json(deep.get()).find("\"x\""), std::string::npos);
}

TEST(PMDeviceIDTool, ArgumentsStandardInputAndExitStatuses) {
  qrtest::TempDir dir;
  const std::string header =
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n";
  std::string device =
      dir.write("device.plist", header +
                                    "<dict>\n"
                                    "<key>MFG</key><string>Hewlett-Packard</string>\n"
                                    "<key>MDL</key><string>HP LaserJet 4000</string>\n"
                                    "<key>pdl</key><string>application/postscript</string>\n"
                                    "<key>SN</key><integer>1234</integer>\n"
                                    "<key>CID</key><data>AP8=</data>\n"
                                    "</dict>\n</plist>\n");
  std::string list =
      dir.write("list.plist", header + "<array><string>MFG</string></array></plist>\n");
  std::string broken = dir.write("broken.plist", header + "<dict><key>MFG</key></plist>\n");
  struct Case {
    std::vector<std::string> args;
    std::string input;
    int status;
    std::vector<std::string> out;  // all in the standard output
    size_t lines;                  // of standard output
    std::vector<std::string> err;  // all in standard error (empty: nothing there)
    bool alsoBuilt = false;        // run the built program too
  } cases[] = {
      // One line per input line, a carriage return dropped, empty lines kept.
      {{},
       "MFG:A\r\n\nMDL:B",
       0,
       {R"j({"input":"MFG:A","make":"A","mod)j", "}\n{\"input\":\"\",", "}\n{\"input\":\"MDL:B\""},
       3,
       {},
       true},
      {{"MFG:X", "MFG:Y"}, "MFG:ignored\n", 0, {R"j("make":"Y")j"}, 2, {}},
      {{"--", "--dict"}, "", 0, {R"j({"input":"--dict",)j"}, 1, {}},
      {{"MFG:hp;MDL:HP LaserJet"},
       "",
       0,
       {R"j("deviceName":"HP LaserJet","softwareUpdateScaneID":"MANUFACTURER:hp;MODEL:HP LaserJet")j"},
       1,
       {},
       true},
      // Unreadable input is reported and the rest still runs.
      {{},
       "MFG:A\n\xC0\xAF\nMFG:B\n",
       2,
       {R"j("make":"B")j"},
       2,
       {"pmdeviceid: standard input, line 2: not valid UTF-8\n"},
       true},
      {{"--escape", "iso-latin-1", "caf\xC3\xA9", "\xE2\x82\xAC", "a b"},
       "",
       2,
       {"caf%E9\n\na%20b\n"},
       3,
       {"pmdeviceid: argument 2: cannot be written in iso-latin-1\n"}},
      // Usage errors.
      {{"--escape"}, "", 1, {}, 0, {"usage: pmdeviceid"}, true},
      {{"--escape", "no-such-encoding", "x"}, "", 1, {}, 0, {"usage: pmdeviceid"}},
      {{"--escape", ""}, "", 1, {}, 0, {"usage: pmdeviceid"}},
      {{"--frob"}, "", 1, {}, 0, {"usage: pmdeviceid"}},
      // Our encoding names and ICU's.
      {{"--escape", "utf-8", "a b/c"}, "", 0, {"a%20b%2Fc\n"}, 1, {}, true},
      {{"--escape", "UTF-16", "a b"}, "", 0, {"a%00%20b\n"}, 1, {}},
      {{"--escape", "windows-1252", "\xE2\x82\xAC"}, "", 0, {"%80\n"}, 1, {}},
      {{"--escape", "ascii"}, "a/b\r\nc d\n", 0, {"a%2Fb\nc%20d\n"}, 2, {}},
      {{"--escape", "Shift_JIS", "\xE6\x97\xA5"}, "", 0, {"%93%FA\n"}, 1, {}},
      // Dictionaries from property-list files and from standard input.
      {{"--dict", device, list, broken, dir / "missing.plist"},
       "",
       2,
       {R"j({"make":"Hewlett-Packard","model":"HP LaserJet 4000","commandSet":"application/postscript",)j"
        R"j("compatibleIDs":"AP8=","serialNumber":1234,"product":"(HP LaserJet 4000)",)j"
        R"j("softwareUpdateScaneID":"MANUFACTURER:Hewlett-Packard;MODEL:HP LaserJet 4000",)j"
        R"j("supportsPCL":false,"supportsPostscript":true,)j"
        R"j("stringValue":"MFG:Hewlett-Packard;MDL:HP LaserJet 4000;pdl:application/postscript;)j"
        R"j(SN:1234;CID:<00ff>"})j"
        "\n"},
       1,
       {list + ": the property list is not a dictionary", broken + ": not a property list",
        dir / "missing.plist: cannot be read"},
       true},
      {{"--dict"},
       header + "<dict><key>product</key><string>(deskjet 990c)</string></dict></plist>\n",
       0,
       {R"j({"make":"hp","model":"deskjet 990c",)j"},
       1,
       {},
       true},
      {{"--dict", "/nonexistent/device.plist"},
       "",
       2,
       {},
       0,
       {"pmdeviceid: /nonexistent/device.plist: cannot be read\n"}},
      {{"--dict"}, "\x01\x02 not a property list", 2, {}, 0, {"pmdeviceid: standard input: "}},
  };
  for (const Case& c : cases) {
    std::istringstream in(c.input);
    std::ostringstream out, err;
    qrtest::ProgramResult inProcess{qr::deviceid::runPMDeviceID(c.args, in, out, err), out.str(),
                                    err.str()};
    std::vector<std::pair<const char*, qrtest::ProgramResult>> runs = {{"in process", inProcess}};
    if (c.alsoBuilt) {
      qrtest::ProgramOptions o;
      o.args = c.args;
      o.input = c.input;
      runs.emplace_back("built", qrtest::runProgram(QUARRIN_BINARY_DIR "/src/pmdeviceid", o));
    }
    for (const auto& [how, r] : runs) {
      SCOPED_TRACE(std::string(how) + ": " + ::testing::PrintToString(c.args) + " < " + c.input);
      EXPECT_EQ(r.status, c.status);
      for (const auto& text : c.out) EXPECT_THAT(r.out, ::testing::HasSubstr(text));
      EXPECT_EQ(size_t(std::count(r.out.begin(), r.out.end(), '\n')), c.lines) << r.out;
      for (const auto& text : c.err) EXPECT_THAT(r.err, ::testing::HasSubstr(text));
      if (c.err.empty()) {
        EXPECT_EQ(r.err, "");
      }
    }
  }
}
