// Lists the connection records of the installation that CACHEWRIGHT_FRAMEWORK
// and CACHEWRIGHT_PREFS point at, in display order: first-party browser
// modules first, then by title. One line per record: connection type, title,
// browser module bundle identifier, browser module URL.
//
// It reads the module cache but never writes it; modules without a current
// cache entry are asked as in a cachewright run.
#include <algorithm>
#include <cstdio>
#include <string>
#include <vector>

#include "hosts/connection_info.h"
#include "hosts/iom_host.h"
#include "hosts/pbm_host.h"
#include "hosts/pm_host.h"
#include "modules/module_factory.h"
#include "tool/discovery.h"

namespace {

std::string text(const qr::Ref<qr::String>& s) { return s ? s->utf8() : "(none)"; }

}  // namespace

int main() {
  auto pmHost = qr::make<qr::PMHost>();
  auto iomHost = qr::make<qr::IOMHost>();
  auto pbmHost = qr::make<qr::PBMHost>();
  qr::QuarrinModuleFactory::resetLoadFailures();
  qr::discoverModules(200, *pmHost, *iomHost, *pbmHost);

  std::vector<qr::Ref<qr::ConnectionInfo>> records;
  for (const auto& item : *iomHost->connectionInfoList())
    if (auto record = qr::cast<qr::ConnectionInfo>(item)) records.push_back(record);
  // The bundle identifier first, as the ordering asks it first: a browser's
  // strings-table title then takes precedence over the title its code gives.
  for (auto& record : records) record->PBMFromVarnex();
  std::stable_sort(records.begin(), records.end(),
                   [](const auto& a, const auto& b) { return a->compare(*b) < 0; });

  for (auto& record : records) {
    std::printf("%-8s %-24s %-36s %s\n", text(record->connectionType()).c_str(),
                text(record->connectionTitle()).c_str(), text(record->connectionBundleID()).c_str(),
                record->PBMURL() ? record->PBMURL()->absoluteString().c_str() : "(none)");
  }
  return 0;
}
