// Reading a dictionary whose keys were chosen to collide: 20,000 keys that
// share the low 16 bits of the unkeyed FNV-1a hash the dictionaries once used,
// against 20,000 ordinary keys, through the reader cachewright -s uses. With
// a keyed hash both sets cost the same.
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <string>
#include <vector>

#include "plist/property_list.h"

namespace {

constexpr uint64_t kPrime = 1099511628211ull;
constexpr char kAlphabet[] = "0123456789ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz_-";

uint64_t fnvStep(uint64_t h, unsigned char c) { return (h ^ c) * kPrime; }
uint64_t oldHash(const std::string& key) {
  uint64_t h = 1469598103934665603ull;
  for (unsigned char c : key) h = fnvStep(h, c);
  return h ^ (h >> 29);
}

// Keys of a fixed prefix and three free characters whose old hash ends in 16 zero bits.
std::vector<std::string> collidingKeys(size_t count) {
  std::vector<std::string> keys;
  for (uint32_t prefix = 0; keys.size() < count; ++prefix) {
    std::string base = "key" + std::to_string(prefix) + ".";
    uint64_t h0 = 1469598103934665603ull;
    for (unsigned char c : base) h0 = fnvStep(h0, c);
    for (int a = 0; a < 64; ++a) {
      uint64_t h1 = fnvStep(h0, kAlphabet[a]);
      for (int b = 0; b < 64; ++b) {
        uint64_t h2 = fnvStep(h1, kAlphabet[b]);
        for (int c = 0; c < 64; ++c) {
          uint64_t h3 = fnvStep(h2, kAlphabet[c]);
          if (((h3 ^ (h3 >> 29)) & 0xFFFF) == 0)
            keys.push_back(base + kAlphabet[a] + kAlphabet[b] + kAlphabet[c]);
        }
      }
    }
  }
  keys.resize(count);
  return keys;
}

std::string dictionaryXML(const std::vector<std::string>& keys) {
  std::string xml = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict>\n";
  for (const auto& k : keys) xml += "\t<key>" + k + "</key>\n\t<integer>1</integer>\n";
  return xml + "</dict>\n</plist>\n";
}

double bestSeconds(const std::string& xml) {
  double best = 1e9;
  for (int run = 0; run < 7; ++run) {
    auto start = std::chrono::steady_clock::now();
    auto value = qr::readPropertyList(xml, qr::Mutability::MutableContainersAndLeaves);
    double s = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    if (!value) std::fprintf(stderr, "the dictionary did not read\n");
    if (s < best) best = s;
  }
  return best;
}

}  // namespace

int main() {
  constexpr size_t kKeys = 20000;
  std::vector<std::string> crafted = collidingKeys(kKeys), ordinary;
  for (size_t i = 0; i < kKeys; ++i) ordinary.push_back("key" + std::to_string(i));
  size_t colliding = 0;
  for (const auto& k : crafted) colliding += (oldHash(k) & 0xFFFF) == 0;
  std::printf("%zu of %zu crafted keys share the low 16 bits of the old hash\n", colliding, kKeys);
  double plain = bestSeconds(dictionaryXML(ordinary));
  double flood = bestSeconds(dictionaryXML(crafted));
  std::printf("ordinary keys %.2f ms, crafted keys %.2f ms, ratio %.2f (best of 7)\n", plain * 1e3,
              flood * 1e3, flood / plain);
}
