// pmdeviceid in process and as the built program: arguments, standard input,
// exit statuses and its JSON records.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <sstream>

#include "deviceid/device_id_json.h"
#include "deviceid/pmdeviceid_tool.h"
#include "support/run_program.h"
#include "values/array.h"
#include "values/data.h"
#include "values/deep_copy.h"
#include "values/number.h"

TEST(PMDeviceID, JSONValues) {
  auto json = [](const qr::Ref<qr::Object>& value) {
    std::string out;
    qr::deviceid::appendJSONValue(out, value.get());
    return out;
  };
  auto d = qr::make<qr::MutableDictionary>();
  d->set("q\"b\\n\n\r\t\b\f\x1F ", qr::Number::real(0.1));
  d->set(qr::Number::integer(3), qr::Number::unsignedInteger(UINT64_MAX));
  qr::Ref<qr::Object> deep = qr::Array::build(std::vector<qr::Ref<qr::Object>>{
      d, qr::Number::real(NAN), qr::String::fromUTF16(u"\xDC00"), qr::Data::copy("a"),
      qr::Data::copy("ab"), qr::Data::copy("abc")});
  EXPECT_EQ(
      json(deep),
      R"j([{"q\"b\\n\n\r\t\b\f\u001f ":0.1,"3":18446744073709551615},"nan","�","YQ==","YWI=","YWJj"])j");
  // Nesting beyond the property-list bound prints as null.
  for (size_t i = 1; i < qr::kMaxPropertyListDepth; ++i) deep = qr::Array::build(std::vector{deep});
  EXPECT_NE(json(deep).find("YWJj"), std::string::npos);
  EXPECT_EQ(json(qr::Array::build(std::vector{deep})).find("YWJj"), std::string::npos);
}

TEST(PMDeviceID, InvocationsGiveTheirOutputAndStatus) {
  qrtest::TempDir dir;
  const std::string plist = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">";
  std::string device = dir.write(
      "device.plist", plist +
                          "<dict><key>MFG</key><string>Hewlett-Packard</string>"
                          "<key>MDL</key><integer>-12</integer><key>pdl</key><true/>"
                          "<key>SN</key><data>AP8QIA==</data>"
                          "<key>CID</key><date>1970-01-01T00:00:00Z</date></dict></plist>");
  std::string list = dir.write("list.plist", plist + "<array/></plist>");
  std::string broken = dir.write("broken.plist", plist + "<dict><key>MFG</key></plist>");
  struct {
    std::vector<std::string> args;
    std::string input;
    int status;
    std::string out;  // a part of standard output
    std::string err;  // a part of standard error, which is empty when this is
    bool alsoBuilt = false;
  } cases[] = {
      // One record per line; a carriage return goes, an empty line stays.
      {{},
       "MFG:HP;MDL:LaserJet 4000;CMD:PJL,PCL,POSTSCRIPT;\r\n\n",
       0,
       R"j({"input":"MFG:HP;MDL:LaserJet 4000;CMD:PJL,PCL,POSTSCRIPT;","make":"HP",)j"
       R"j("model":"LaserJet 4000","commandSet":"PJL,PCL,POSTSCRIPT","compatibleIDs":null,)j"
       R"j("serialNumber":null,"product":"(HP LaserJet 4000)","deviceName":"HP LaserJet 4000",)j"
       R"j("softwareUpdateScaneID":"MANUFACTURER:HP;MODEL:LaserJet 4000","supportsPCL":true,)j"
       R"j("supportsPostscript":true,"dictionaryValue":{"mfg":"HP","mdl":"LaserJet 4000",)j"
       R"j("cmd":"PJL,PCL,POSTSCRIPT","":""}})j"
       "\n{\"input\":\"\",\"make\":null,",
       "",
       true},
      {{"MFG:X", "MFG:Y"}, "MFG:ignored\n", 0, "\"make\":\"X\"", ""},
      {{"--", "--dict"}, "", 0, "{\"input\":\"--dict\",", ""},
      {{},
       "MFG:A\n\xC0\nMFG:B",
       2,
       "\"mfg\":\"A\"}}\n{\"input\":\"MFG:B\"",
       "line 2: not valid",
       true},
      // Letters, digits and -_.!~*'$ stay; all else is escaped per byte in the encoding.
      {{"--escape", "utf-8", " @?&+,;=/():\\", "azAZ09-_.!~*'$", "%#<>\"{}|^`[]\x7F\t",
        "\xC3\xA9 \xF0\x9F\x96\xA8"},
       "",
       0,
       "%20%40%3F%26%2B%2C%3B%3D%2F%28%29%3A%5C\nazAZ09-_.!~*'$\n"
       "%25%23%3C%3E%22%7B%7D%7C%5E%60%5B%5D%7F%09\n%C3%A9%20%F0%9F%96%A8\n",
       ""},
      {{"--escape", "iso-latin-1", "\xC3\xA9", "\xE2\x82\xAC", "a"},
       "",
       2,
       "%E9\n\na\n",
       "2: cannot"},
      {{"--escape", "UTF-16"},
       "a/b\xF0\x9F\x96\xA8\r\n\xC0\n",
       2,
       "a%00%2Fb%D8%3D%DD%A8\n\n",
       "2: not valid",
       true},
      {{"--escape", "ibm-037", "a b"}, "", 0, "a%40b\n", ""},
      {{"--escape"}, "", 1, "", "--escape needs an ENCODING\nusage: pmdeviceid", true},
      {{"--escape", "no-such-encoding", "x"}, "", 1, "", "unknown encoding"},
      {{"--escape", ""}, "", 1, "", "unknown encoding"},
      {{"--frob"}, "", 1, "", "unknown option '--frob'"},
      {{"--dict", device, list, broken, dir / "missing.plist"},
       "",
       2,
       R"j({"make":"Hewlett-Packard","model":-12,"commandSet":true,)j"
       R"j("compatibleIDs":"1970-01-01T00:00:00Z","serialNumber":"AP8QIA==","product":"(HP -12)",)j"
       R"j("softwareUpdateScaneID":"MANUFACTURER:Hewlett-Packard;MODEL:-12","supportsPCL":false,)j"
       R"j("supportsPostscript":false,"stringValue":"MFG:Hewlett-Packard;MDL:-12;pdl:true;)j"
       R"j(SN:<00ff1020>;CID:1970-01-01T00:00:00Z"})j"
       "\n",
       list + ": the property list is not a dictionary\npmdeviceid: " + broken +
           ": not a property list\npmdeviceid: " + dir / "missing.plist: cannot be read\n",
       true},
      {{"--dict"}, "\x01\x02", 2, "", "pmdeviceid: standard input: not a property list"},
  };
  for (const auto& c : cases) {
    std::istringstream in(c.input);
    std::ostringstream out, err;
    int status = qr::deviceid::runPMDeviceID(c.args, in, out, err);
    std::vector<std::pair<const char*, qrtest::ProgramResult>> runs = {
        {"in process", {status, out.str(), err.str()}}};
    qrtest::ProgramOptions options;
    options.args = c.args, options.input = c.input;
    if (c.alsoBuilt)
      runs.emplace_back("built", qrtest::runProgram(QUARRIN_BINARY_DIR "/src/pmdeviceid", options));
    for (const auto& [how, r] : runs) {
      SCOPED_TRACE(std::string(how) + ": " + ::testing::PrintToString(c.args) + " < " + c.input);
      EXPECT_EQ(r.status, c.status);
      EXPECT_THAT(r.out, ::testing::HasSubstr(c.out));
      EXPECT_THAT(r.err, ::testing::HasSubstr(c.err));
      EXPECT_EQ(r.err.empty(), c.err.empty()) << r.err;
    }
  }
  // Output that cannot be written fails the run.
  std::istringstream in;
  std::ostringstream err;
  std::ostream unwritable(nullptr);
  EXPECT_EQ(qr::deviceid::runPMDeviceID({"MFG:A"}, in, unwritable, err), 2);
  EXPECT_EQ(err.str(), "pmdeviceid: cannot write standard output\n");
}
