#include "deviceid/pmdeviceid_tool.h"

#include <functional>
#include <istream>
#include <iterator>
#include <optional>
#include <ostream>

#include "deviceid/device_id_json.h"
#include "deviceid/percent_escape.h"
#include "platform/file_io.h"
#include "plist/property_list.h"
#include "values/dictionary.h"
#include "values/string.h"

namespace qr::deviceid {
namespace {

constexpr const char* kUsage =
    "usage: pmdeviceid [STRING ...]\n"
    "       pmdeviceid --dict [FILE ...]\n"
    "       pmdeviceid --escape ENCODING [STRING ...]\n"
    "Without STRING arguments, reads one device ID string per line from standard input;\n"
    "--dict without FILE reads one property list from standard input.\n"
    "ENCODING: utf-8, ascii, iso-latin-1, windows-1252, utf-16, or any name ICU knows.\n";

int usageError(std::ostream& err, const std::string& problem) {
  if (!problem.empty()) err << "pmdeviceid: " << problem << "\n";
  err << kUsage;
  return kPMDeviceIDUsage;
}

// Feeds each input string to handle with a name for messages: the arguments,
// or else the lines of standard input without their line ends.
void forEachInput(const std::vector<std::string>& strings, std::istream& in,
                  const std::function<void(const std::string&, const std::string&)>& handle) {
  if (!strings.empty()) {
    for (size_t i = 0; i < strings.size(); ++i)
      handle(strings[i], "argument " + std::to_string(i + 1));
    return;
  }
  std::string line;
  for (size_t number = 1; std::getline(in, line); ++number) {
    if (!line.empty() && line.back() == '\r') line.pop_back();
    handle(line, "standard input, line " + std::to_string(number));
  }
}

int runStrings(const std::vector<std::string>& strings, std::istream& in, std::ostream& out,
               std::ostream& err) {
  int status = kPMDeviceIDOK;
  forEachInput(strings, in, [&](const std::string& input, const std::string& name) {
    Ref<String> id = String::fromUTF8(input);
    if (!id) {
      err << "pmdeviceid: " << name << ": not valid UTF-8\n";
      status = kPMDeviceIDBadInput;
      return;
    }
    out << deviceIDRecord(*id) << '\n';
  });
  return status;
}

// One property list whose top level must be a dictionary; a message otherwise.
int printDictionary(std::optional<std::string> bytes, const std::string& name, std::ostream& out,
                    std::ostream& err) {
  if (!bytes) {
    err << "pmdeviceid: " << name << ": cannot be read\n";
    return kPMDeviceIDBadInput;
  }
  Ref<Object> plist = readPropertyList(*bytes);
  if (!plist) {
    err << "pmdeviceid: " << name << ": not a property list\n";
    return kPMDeviceIDBadInput;
  }
  if (plist->kind() != TypeKind::Dictionary) {
    err << "pmdeviceid: " << name << ": the property list is not a dictionary\n";
    return kPMDeviceIDBadInput;
  }
  out << deviceDictionaryRecord(static_cast<const Dictionary&>(*plist)) << '\n';
  return kPMDeviceIDOK;
}

int runDictionaries(const std::vector<std::string>& files, std::istream& in, std::ostream& out,
                    std::ostream& err) {
  if (files.empty()) {
    std::string bytes(std::istreambuf_iterator<char>(in), {});
    std::optional<std::string> read;
    if (!in.bad()) read = std::move(bytes);
    return printDictionary(std::move(read), "standard input", out, err);
  }
  int status = kPMDeviceIDOK;
  for (const std::string& file : files)
    if (printDictionary(readFile(file), file, out, err) != kPMDeviceIDOK)
      status = kPMDeviceIDBadInput;
  return status;
}

int runEscape(const std::string& encodingName, const std::vector<std::string>& strings,
              std::istream& in, std::ostream& out, std::ostream& err) {
  std::optional<TextEncoding> ours = textEncodingNamed(encodingName);
  if (!ours && (encodingName.empty() || !isKnownConverterName(encodingName.c_str())))
    return usageError(err, "unknown encoding '" + encodingName + "'");
  int status = kPMDeviceIDOK;
  forEachInput(strings, in, [&](const std::string& input, const std::string& name) {
    Ref<String> text = String::fromUTF8(input);
    if (!text) {
      err << "pmdeviceid: " << name << ": not valid UTF-8\n";
      out << '\n';
      status = kPMDeviceIDBadInput;
      return;
    }
    auto escaped = ours ? percentEscape(*text, *ours) : percentEscape(*text, encodingName.c_str());
    if (!escaped) {
      err << "pmdeviceid: " << name << ": cannot be written in " << encodingName << "\n";
      out << '\n';
      status = kPMDeviceIDBadInput;
      return;
    }
    out << *escaped << '\n';
  });
  return status;
}

}  // namespace

int runPMDeviceID(const std::vector<std::string>& args, std::istream& in, std::ostream& out,
                  std::ostream& err) {
  auto rest = [&](size_t from) {
    return std::vector<std::string>(args.begin() + static_cast<ptrdiff_t>(from), args.end());
  };
  int status;
  if (args.empty()) {
    status = runStrings({}, in, out, err);
  } else if (args[0] == "--dict") {
    status = runDictionaries(rest(1), in, out, err);
  } else if (args[0] == "--escape") {
    if (args.size() < 2) return usageError(err, "--escape needs an ENCODING");
    status = runEscape(args[1], rest(2), in, out, err);
  } else if (args[0] == "--") {
    // Lets a device ID string that starts with "--" through.
    status = args.size() > 1 ? runStrings(rest(1), in, out, err) : runStrings({}, in, out, err);
  } else if (args[0].starts_with("--")) {
    return usageError(err, "unknown option '" + args[0] + "'");
  } else {
    status = runStrings(args, in, out, err);
  }
  if (!out.flush()) {
    err << "pmdeviceid: cannot write standard output\n";
    return kPMDeviceIDBadInput;
  }
  return status;
}

}  // namespace qr::deviceid
