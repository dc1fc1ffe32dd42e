// The order in which a bundle's .lproj folders are tried. The user's
// languages come from the first of LANGUAGE, LC_ALL, LC_MESSAGES and LANG that
// is set and not empty, read afresh at every call so a changed environment
// takes effect at once.
#include <cstdlib>
#include <string>
#include <string_view>
#include <vector>

#include "bundles/bundle.h"

namespace qr {
namespace {

// A folder name must stay inside the resources folder.
bool usableFolderName(std::string_view name) {
  return !name.empty() && name != "." && name != ".." &&
         name.find_first_of(std::string_view("/\0", 2)) == std::string_view::npos;
}

void addUnique(std::vector<std::string>& order, std::string_view name) {
  if (!usableFolderName(name)) return;
  for (const auto& existing : order)
    if (existing == name) return;
  order.emplace_back(name);
}

// "de_DE.UTF-8@euro" gives "de_DE" then "de"; "C" and "POSIX" give nothing.
void addLocale(std::vector<std::string>& order, std::string_view locale) {
  size_t cut = locale.find_first_of(".@");
  if (cut != std::string_view::npos) locale = locale.substr(0, cut);
  if (locale.empty() || locale == "C" || locale == "POSIX") return;
  addUnique(order, locale);
  size_t underscore = locale.find('_');
  if (underscore != std::string_view::npos && underscore > 0)
    addUnique(order, locale.substr(0, underscore));
}

}  // namespace

std::vector<std::string> localizationOrder(const std::string& developmentRegion) {
  std::vector<std::string> order;
  for (const char* variable : {"LANGUAGE", "LC_ALL", "LC_MESSAGES", "LANG"}) {
    const char* value = std::getenv(variable);
    if (!value || !*value) continue;
    // LANGUAGE lists several languages by priority; the others name one locale.
    std::string_view rest(value);
    while (!rest.empty()) {
      size_t colon = rest.find(':');
      addLocale(order, rest.substr(0, colon));
      if (colon == std::string_view::npos) break;
      rest.remove_prefix(colon + 1);
    }
    break;
  }
  addLocale(order, developmentRegion);
  for (const char* fallback : {"en", "English", "Base"}) addUnique(order, fallback);
  for (auto& name : order) name += ".lproj";
  return order;
}

}  // namespace qr
