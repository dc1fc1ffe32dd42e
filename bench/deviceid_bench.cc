// Throughput of the device ID string operations over a generated set of varied
// device ID strings: the IEEE 1284 form with its key variants, the USB form,
// the network-discovery form and a few non-ASCII strings.
#include <time.h>

#include <cstdint>
#include <cstdio>
#include <string>
#include <vector>

#include "deviceid/string_additions.h"

namespace {

using qr::Ref;
using qr::String;

class Random {
 public:
  explicit Random(uint64_t seed) : state_(seed) {}
  uint64_t next() {
    state_ ^= state_ << 13;
    state_ ^= state_ >> 7;
    state_ ^= state_ << 17;
    return state_;
  }
  size_t below(size_t n) { return static_cast<size_t>(next() % n); }
  bool chance(int percent) { return below(100) < static_cast<size_t>(percent); }
  template <class T, size_t N>
  const T& pick(const T (&items)[N]) {
    return items[below(N)];
  }

 private:
  uint64_t state_;
};

const char* const kMakers[] = {
    "HP",      "Hewlett-Packard", "hp",           "Lexmark International",
    "Lexmark", "Canon",           "EPSON",        "Brother",
    "Xerox",   "Kyocera",         "Ricoh",        "Samsung",
    "Dell",    "Konica Minolta",  "OKI DATA CORP"};
const char* const kSeries[] = {
    "LaserJet",   "OfficeJet Pro", "DeskJet", "T",   "MX",     "PIXMA", "Stylus",        "HL-",
    "WorkCentre", "ECOSYS",        "Aficio",  "ML-", "bizhub", "C",     "Color LaserJet"};
const char* const kMakeKeys[] = {"MFG:", "MANUFACTURER:", "usb_MFG:", "mfg:", "Manufacturer:"};
const char* const kModelKeys[] = {"MDL:", "MODEL:", "usb_MDL:", "mdl:", "Model:"};
const char* const kCommandKeys[] = {"CMD:", "COMMAND SET:", "usb_CMD:", "cmd:"};
const char* const kCommands[] = {"PJL", "PCL", "PCL6",   "PCLXL", "POSTSCRIPT", "PS",  "PDF",
                                 "URF", "PWG", "ESCPL2", "BDC",   "D4",         "MLC", "LEDM"};
const char* const kWide[] = {"\xC3\x89pson", "Imprimante caf\xC3\xA9", "\xE3\x83\x97\xE3\x83\xAA",
                             "Drucker \xF0\x9F\x96\xA8"};

std::string commandList(Random& r) {
  std::string out;
  size_t n = 1 + r.below(5);
  for (size_t i = 0; i < n; ++i) {
    if (i) out += r.chance(90) ? "," : " ";
    out += r.pick(kCommands);
  }
  return out;
}

std::string generate(Random& r) {
  std::string maker = r.pick(kMakers);
  std::string model = std::string(r.pick(kSeries)) + std::to_string(100 + r.below(9900));
  if (r.chance(30)) model = maker + " " + model;
  if (r.chance(3)) model += std::string(" ") + r.pick(kWide);
  std::vector<std::string> parts;
  int form = static_cast<int>(r.below(100));
  if (form < 10) {  // network discovery record
    parts.push_back("ty:" + maker + " " + model);
    parts.push_back(std::string("pdl:application/") + (r.chance(50) ? "postscript," : "") +
                    "application/pdf,image/urf");
    parts.push_back("product:(" + maker + " " + model + ")");
  } else if (form < 15) {  // product value alone
    parts.push_back(r.chance(20) ? "product:(deskjet " + std::to_string(r.below(999)) + "c)"
                                 : "product:(" + maker + " " + model + ")");
  } else {
    parts.push_back(r.pick(kMakeKeys) + maker);
    parts.push_back(r.pick(kModelKeys) + model);
    parts.push_back(r.pick(kCommandKeys) + commandList(r));
    if (r.chance(50)) parts.push_back("CLS:PRINTER");
    if (r.chance(40)) parts.push_back("DES:" + maker + " " + model);
    if (r.chance(30)) parts.push_back("SN:CN" + std::to_string(r.next() % 100000000));
    if (r.chance(10)) parts.push_back("CID:" + maker + "_generic");
    for (size_t i = parts.size(); i > 1; --i) std::swap(parts[i - 1], parts[r.below(i)]);
  }
  std::string out;
  for (const auto& p : parts) {
    if (r.chance(5)) out += ' ';
    out += p;
    out += ';';
  }
  if (r.chance(30)) out.pop_back();
  return out;
}

// CPU time of this thread: figures per second on one core, however busy the
// machine's other cores are.
double cpuSeconds() {
  timespec t;
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &t);
  return static_cast<double>(t.tv_sec) + static_cast<double>(t.tv_nsec) * 1e-9;
}

template <class Op>
void measure(const char* name, const std::vector<Ref<String>>& ids, Op op) {
  size_t sink = 0, count = 0;
  for (const auto& id : ids) sink += op(*id);  // warm up
  double start = cpuSeconds(), elapsed = 0;
  do {
    for (const auto& id : ids) sink += op(*id);
    count += ids.size();
    elapsed = cpuSeconds() - start;
  } while (elapsed < 2.0);
  std::printf("%-22s %12.0f strings/s  (%.0f ns each; check %zu)\n", name,
              static_cast<double>(count) / elapsed, 1e9 * elapsed / static_cast<double>(count),
              sink % 10);
}

size_t lengthOf(const Ref<String>& s) { return s ? s->length() + 1 : 0; }

}  // namespace

int main() {
  Random random(0x9E3779B97F4A7C15ull);
  std::vector<Ref<String>> ids;
  const size_t kCount = 20000;
  size_t wide = 0, units = 0;
  for (size_t i = 0; i < kCount; ++i) {
    ids.push_back(String::make(generate(random)));
    wide += !ids.back()->isNarrow();
    units += ids.back()->length();
  }
  std::printf(
      "deviceid_bench: %zu device ID strings (%zu wide), %.1f code units on average; "
      "strings per CPU-second of one thread\n",
      ids.size(), wide, static_cast<double>(units) / ids.size());
  using namespace PMStringAdditions;
  measure("make", ids, [](const String& s) { return lengthOf(make(s)); });
  measure("model", ids, [](const String& s) { return lengthOf(model(s)); });
  measure("deviceName", ids, [](const String& s) { return lengthOf(deviceName(s)); });
  measure("dictionaryValue", ids, [](const String& s) {
    auto d = dictionaryValue(s);
    return d ? d->count() : 0;
  });
  measure("product", ids, [](const String& s) { return product(s)->length(); });
  measure("softwareUpdateScaneID", ids,
          [](const String& s) { return lengthOf(softwareUpdateScaneID(s)); });
  measure("supportsPostscript", ids, [](const String& s) { return size_t(supportsPostscript(s)); });
  return 0;
}
