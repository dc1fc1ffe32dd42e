// Throughput of the binary and text property-list readers on a printer list
// of 100,000 entries, and the cost of a file that references one large object
// a thousand times.
#include <chrono>
#include <cstdio>
#include <string>
#include <vector>

#include "plist/property_list.h"
#include "values/deep_copy.h"

namespace {

std::string bigEndian(uint64_t v, size_t n) {
  std::string out(n, '\0');
  for (size_t i = n; i-- > 0; v >>= 8) out[i] = static_cast<char>(v & 0xFF);
  return out;
}

std::string counted(int type, uint64_t count) {
  if (count < 15) return std::string(1, static_cast<char>(type << 4 | count));
  return std::string(1, static_cast<char>(type << 4 | 0xF)) + "\x13" + bigEndian(count, 8);
}

// Objects in order, four-byte references and offsets, the first object on top.
std::string bplist(const std::vector<std::string>& objects) {
  std::string file = "bplist00", table;
  for (const auto& o : objects) {
    table += bigEndian(file.size(), 4);
    file += o;
  }
  uint64_t tableOffset = file.size();
  file += table + std::string(6, '\0') + "\x04\x04" + bigEndian(objects.size(), 8) +
          bigEndian(0, 8) + bigEndian(tableOffset, 8);
  return file;
}

// An array of n dictionaries { name = "Printer i"; id = i; } sharing their keys.
std::string binaryPrinters(uint32_t n) {
  std::vector<std::string> objects(1);
  objects.push_back(counted(0x5, 4) + "name");
  objects.push_back(counted(0x5, 2) + "id");
  std::string top = counted(0xA, n);
  for (uint32_t i = 0; i < n; ++i) {
    uint32_t dict = static_cast<uint32_t>(objects.size());
    top += bigEndian(dict, 4);
    std::string name = "Printer " + std::to_string(i);
    objects.push_back(counted(0xD, 2) + bigEndian(1, 4) + bigEndian(2, 4) + bigEndian(dict + 1, 4) +
                      bigEndian(dict + 2, 4));
    objects.push_back(counted(0x5, name.size()) + name);
    // Appended rather than "\x13" + ...: GCC 12 at -O3 misreads that as an overlapping copy.
    std::string integer(1, '\x13');
    integer += bigEndian(i, 8);
    objects.push_back(integer);
  }
  objects[0] = top;
  return bplist(objects);
}

std::string textPrinters(uint32_t n) {
  std::string text = "(\n";
  for (uint32_t i = 0; i < n; ++i)
    text +=
        "  { name = \"Printer " + std::to_string(i) + "\"; id = " + std::to_string(i) + "; },\n";
  return text + ")\n";
}

template <class F>
double seconds(F&& f, int rounds) {
  auto start = std::chrono::steady_clock::now();
  for (int i = 0; i < rounds; ++i) f();
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count() / rounds;
}

// A read that fails is marked: "refused" where the file is built to be
// refused (it expands past the reader's budget), "FAILED" elsewhere.
void report(const char* what, const std::string& bytes, qr::Mutability m,
            qr::Ref<qr::Object> (*reader)(std::string_view, qr::Mutability),
            bool refusalExpected = false) {
  bool ok = true;
  double s = seconds([&] { ok = ok && reader(bytes, m); }, 5);
  std::printf("%-34s %-14s %8.1f ms  %7.1f MB/s%s\n", what,
              m == qr::Mutability::Immutable           ? "immutable"
              : m == qr::Mutability::MutableContainers ? "mutable"
                                                       : "mutable+leaves",
              s * 1e3, bytes.size() / s / 1e6,
              ok                ? ""
              : refusalExpected ? "  (refused)"
                                : "  (FAILED)");
}

}  // namespace

int main() {
  const qr::Mutability modes[] = {qr::Mutability::Immutable, qr::Mutability::MutableContainers,
                                  qr::Mutability::MutableContainersAndLeaves};
  auto binary = binaryPrinters(100000);
  auto text = textPrinters(100000);
  std::printf("binary file %zu bytes, text file %zu bytes\n", binary.size(), text.size());
  for (auto m : modes)
    report("binary, 100,000 dictionaries", binary, m, qr::readBinaryPropertyList);
  for (auto m : modes) report("text, 100,000 dictionaries", text, m, qr::readTextPropertyList);

  // One 1 MiB data object referenced 1000 times from a 1 MiB file: 1 GB as a
  // tree, past every mode's budget.
  std::vector<std::string> objects = {counted(0xA, 1000),
                                      counted(0x4, 1 << 20) + std::string(1 << 20, 'p')};
  for (int i = 0; i < 1000; ++i) objects[0] += bigEndian(1, 4);
  auto shared = bplist(objects);
  for (auto m : modes)
    report("binary, 1 MiB object x 1000 refs", shared, m, qr::readBinaryPropertyList, true);
  return 0;
}
