// Interoperability with Python's plistlib, an independent XML property-list
// implementation: each side reads what the other writes. Values are compared
// through a typed dump that both sides print the same way.
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cinttypes>
#include <cmath>
#include <cstring>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "plist/property_list.h"
#include "support/temp_dir.h"
#include "values/array.h"
#include "values/boolean.h"
#include "values/data.h"
#include "values/date.h"
#include "values/dictionary.h"
#include "values/number.h"
#include "values/string.h"

using namespace qr;

namespace {

// dump() gives strings and data as hex, reals as their IEEE bits, dates as
// whole Unix seconds, and dictionaries with keys in UTF-16 code-unit order.
const char kPlistScript[] = R"PY(
import datetime as dt, math, os, plistlib, struct, sys

def dump(v):
    if isinstance(v, bool): return 't;' if v else 'f;'
    if isinstance(v, int): return 'i%d;' % v
    if isinstance(v, float):
        return 'rnan;' if math.isnan(v) else 'r' + struct.pack('>d', v).hex() + ';'
    if isinstance(v, str): return 's' + v.encode('utf-8').hex() + ';'
    if isinstance(v, bytes): return 'd' + v.hex() + ';'
    if isinstance(v, dt.datetime):
        return 'D%d;' % (v - dt.datetime(1970, 1, 1)).total_seconds()
    if isinstance(v, list): return '[' + ''.join(dump(x) for x in v) + ']'
    if isinstance(v, dict):
        keys = sorted(v, key=lambda k: k.encode('utf-16-be'))
        return '{' + ''.join(dump(k) + dump(v[k]) for k in keys) + '}'
    raise TypeError(type(v))

def deep(n):
    v = 'bottom'
    for i in range(n): v = [v] if i % 2 else {'level %d' % i: v}
    return v

values = [
    {
        'nested': {'level1': [1, [2, [3, {'deep': ['x', {}, []]}]]]},
        'empty dict': {}, 'empty array': [], 'empty string': '', 'empty data': b'',
        'text': 'caf\u00e9 \U0001F5A8 <tag> & \'single\' "double" ]]> \ttab\nnewline',
        'astral key \U0001F600': 'v', '\uff5e': 'sorts after the astral key',
        'ints': [0, 1, -1, 2**31, -2**31 - 1, 2**63 - 1, -2**63, 2**63, 2**64 - 1],
        'reals': [0.0, -0.0, 0.1, -1.5e-300, 1e300, 5e-324, 2.5, float('inf'),
                  float('-inf'), float('nan')],
        'dates': [dt.datetime(2001, 1, 1), dt.datetime(1969, 7, 20, 20, 17, 40),
                  dt.datetime(2038, 1, 19, 3, 14, 8), dt.datetime(1, 1, 1)],
        'data': [b'\x00', b'\xff\xfe', bytes(range(256)) * 3],
        'bools': [True, False],
    },
    [[[]], {}, 'x'], '\U0001F5A8 only', -2**63, 2**64 - 1, 3.25, bytes(range(100)),
    dt.datetime(2024, 2, 29, 12, 0, 0), True, deep(60),
]

if sys.argv[1] == 'write':
    for i, v in enumerate(values):
        with open(os.path.join(sys.argv[2], '%d.xml' % i), 'wb') as f:
            f.write(plistlib.dumps(v, fmt=plistlib.FMT_XML))
        print(dump(v))
else:
    for path in sys.argv[2:]:
        with open(path, 'rb') as f:
            print(dump(plistlib.load(f)))
)PY";

struct PythonRun {
  int status = -1;  // 127: python3 could not be started
  std::string out;
};

PythonRun runPython(const std::vector<std::string>& args) {
  PythonRun run;
  int pipeFds[2];
  if (pipe(pipeFds) != 0) return run;
  pid_t pid = fork();
  if (pid == 0) {
    dup2(pipeFds[1], 1);
    close(pipeFds[0]);
    close(pipeFds[1]);
    std::vector<char*> argv{const_cast<char*>("python3"), const_cast<char*>("-c"),
                            const_cast<char*>(kPlistScript)};
    for (const auto& a : args) argv.push_back(const_cast<char*>(a.c_str()));
    argv.push_back(nullptr);
    execvp("python3", argv.data());
    _exit(127);
  }
  close(pipeFds[1]);
  char buf[65536];
  ssize_t n;
  while ((n = read(pipeFds[0], buf, sizeof buf)) > 0) run.out.append(buf, size_t(n));
  close(pipeFds[0]);
  int status = 0;
  waitpid(pid, &status, 0);
  run.status = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  return run;
}

std::vector<std::string> lines(const std::string& text) {
  std::vector<std::string> out;
  std::istringstream in(text);
  for (std::string line; std::getline(in, line);) out.push_back(line);
  return out;
}

std::string hex(std::string_view bytes) {
  static const char digits[] = "0123456789abcdef";
  std::string out;
  for (unsigned char c : bytes) {
    out += digits[c >> 4];
    out += digits[c & 15];
  }
  return out;
}

std::string dump(const Object& v) {
  switch (v.kind()) {
    case TypeKind::Boolean:
      return static_cast<const Boolean&>(v).value() ? "t;" : "f;";
    case TypeKind::Number: {
      const auto& n = static_cast<const Number&>(v);
      if (!n.isReal())
        return "i" +
               (n.isUnsigned() ? std::to_string(n.uint64Value()) : std::to_string(n.int64Value())) +
               ";";
      double d = n.doubleValue();
      if (std::isnan(d)) return "rnan;";
      uint64_t bits;
      std::memcpy(&bits, &d, sizeof bits);
      char buf[24];
      std::snprintf(buf, sizeof buf, "r%016" PRIx64 ";", bits);
      return buf;
    }
    case TypeKind::String:
      return "s" + hex(static_cast<const String&>(v).utf8()) + ";";
    case TypeKind::Data:
      return "d" + hex(static_cast<const Data&>(v).view()) + ";";
    case TypeKind::Date:
      return "D" + std::to_string(int64_t(std::floor(static_cast<const Date&>(v).unixTime()))) +
             ";";
    case TypeKind::Array: {
      std::string out = "[";
      for (const auto& item : static_cast<const Array&>(v)) out += dump(*item);
      return out + "]";
    }
    case TypeKind::Dictionary: {
      const auto& d = static_cast<const Dictionary&>(v);
      auto keys = d.keys();
      std::sort(keys.begin(), keys.end(), [](const Ref<Object>& a, const Ref<Object>& b) {
        return static_cast<const String&>(*a).compare(static_cast<const String&>(*b)) < 0;
      });
      std::string out = "{";
      for (const auto& k : keys) out += dump(*k) + dump(*d.get(*k));
      return out + "}";
    }
    default:
      return "?";
  }
}

class PythonInterop : public ::testing::Test {
 protected:
  static void SetUpTestSuite() { available_ = runPython({"read"}).status != 127; }
  void SetUp() override {
    if (!available_) GTEST_SKIP() << "python3 is not installed";
  }

  // plistlib's readings of what our writer makes of the values.
  std::vector<std::string> pythonReadings(const std::vector<Ref<Object>>& values) {
    std::vector<std::string> args{"read"};
    for (size_t i = 0; i < values.size(); ++i) {
      auto xml = writeXMLPropertyList(*values[i]);
      if (!xml) return {"(not written)"};
      args.push_back(dir_ / ("ours" + std::to_string(i) + ".xml"));
      std::ofstream(args.back(), std::ios::binary) << *xml;
    }
    PythonRun run = runPython(args);
    if (run.status != 0) return {"(python failed)"};
    return lines(run.out);
  }

  static bool available_;
  qrtest::TempDir dir_;
};

bool PythonInterop::available_ = false;

}  // namespace

TEST_F(PythonInterop, WeReadWhatPlistlibWritesAndItReadsWhatWeWrite) {
  PythonRun run = runPython({"write", dir_.path()});
  ASSERT_EQ(run.status, 0);
  auto expected = lines(run.out);
  ASSERT_EQ(expected.size(), 10u);
  std::vector<Ref<Object>> ours;
  for (size_t i = 0; i < expected.size(); ++i) {
    std::ifstream in(dir_ / (std::to_string(i) + ".xml"), std::ios::binary);
    std::string xml((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    for (auto m : {Mutability::MutableContainersAndLeaves, Mutability::Immutable}) {
      auto value = readXMLPropertyList(xml, m);
      ASSERT_TRUE(value) << xml;
      EXPECT_EQ(dump(*value), expected[i]) << xml;
      if (m == Mutability::Immutable) ours.push_back(value);
    }
  }
  EXPECT_EQ(pythonReadings(ours), expected);
}

TEST_F(PythonInterop, PlistlibReadsTheCornersOfOurOutput) {
  // What plistlib itself cannot write: carriage returns (it turns them into
  // line feeds), and keys whose order differs between code points and UTF-16.
  auto d = make<MutableDictionary>();
  d->set("cr", String::make("one\rtwo\r\nthree"));
  d->set("\xF0\x9F\x98\x80", Number::unsignedInteger(UINT64_MAX));
  d->set("\xEF\xBD\x9E", Number::integer(INT64_MIN));
  d->set("markup", String::make("<&>]]>\t"));
  auto list = make<MutableArray>();
  list->append(Number::real(-0.0));
  list->append(Number::real(NAN));
  list->append(Number::real(-HUGE_VAL));
  list->append(Number::real(0.1 + 0.2));
  list->append(Data::copy(std::string(1000, '\xAB')));
  list->append(Date::fromISO8601("9999-12-31T23:59:59Z"));
  list->append(make<MutableDictionary>());
  d->set("list", list);
  EXPECT_EQ(pythonReadings({d}), std::vector<std::string>{dump(*d)});
}
