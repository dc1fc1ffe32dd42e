#include "hosts/connection_info.h"

#include <unicode/uchar.h>
#include <unicode/ustring.h>

#include "bundles/bundle.h"
#include "bundles/c_bridge.h"
#include "modules/module_factory.h"
#include "modules/pbm_module.h"
#include "platform/file_io.h"

namespace qr {
namespace {

constexpr std::string_view kFirstPartyPrefix = "com.varnex.print.pbm";

int caseInsensitiveCompare(const String& a, const String& b) {
  std::u16string ua = a.utf16(), ub = b.utf16();
  UErrorCode error = U_ZERO_ERROR;
  int32_t r = u_strCaseCompare(ua.data(), static_cast<int32_t>(ua.size()), ub.data(),
                               static_cast<int32_t>(ub.size()), U_FOLD_CASE_DEFAULT, &error);
  return (r > 0) - (r < 0);
}

}  // namespace

ConnectionInfo::ConnectionInfo(Ref<String> connectionType, Ref<URL> IOMURL, Ref<URL> PBMURL) {
  setConnectionType(std::move(connectionType));
  setIOMURL(std::move(IOMURL));
  setPBMURL(std::move(PBMURL));
}

Ref<String> ConnectionInfo::connectionBundleID() {
  if (connectionBundleID_) return connectionBundleID_;
  auto path = PBMURL_ ? PBMURL_->fileSystemPath() : std::nullopt;
  Ref<Bundle> bundle = path && isDirectory(*path) ? Bundle::open(*path) : nullptr;
  if (!bundle) {
    setConnectionBundleID(String::empty());
    return connectionBundleID_;
  }
  setConnectionBundleID(Ref<String>(bundle->identifier()));
  if (!connectionTitle_) {
    // The browser's strings table may name it by identifier or by connection type.
    auto noIdentifier = String::make("!identifier"), noConnection = String::make("!connection");
    Ref<String> title = noIdentifier;
    if (connectionBundleID_) title = bundle->localizedString(*connectionBundleID_, noIdentifier);
    if (title->isEqual(*noIdentifier))
      title =
          connectionType_ ? bundle->localizedString(*connectionType_, noConnection) : noConnection;
    if (!title->isEqual(*noConnection)) setConnectionTitle(title);
  }
  return connectionBundleID_;
}

Ref<String> ConnectionInfo::connectionTitle() {
  if (connectionTitle_) return connectionTitle_;
  bool answered = false;
  try {
    if (Ref<PBMModule> module = QuarrinModuleFactory::PBMModuleForURL(PBMURL_.get())) {
      QrStringRef title = nullptr;
      int32_t status = module->loadPluginInterface(nullptr, nullptr, nullptr, kPBMTitleOnlyFlags,
                                                   nullptr, nullptr, nullptr, nullptr, &title);
      if (status == 0) {
        // The title stays the browser's; the record keeps its own reference.
        setConnectionTitle(Ref<String>(fromCAs<String>(title)));
        answered = true;
      }
    }
  } catch (...) {
    // A browser that cannot tell its title is named by its bundle identifier.
  }
  if (!answered) setConnectionTitle(connectionBundleID());
  return connectionTitle_;
}

bool ConnectionInfo::PBMFromVarnex() {
  Ref<String> id = connectionBundleID();
  return id && id->hasPrefix(kFirstPartyPrefix);
}

int ConnectionInfo::compare(ConnectionInfo& other) {
  bool mine = PBMFromVarnex(), theirs = other.PBMFromVarnex();
  if (mine != theirs) return mine ? -1 : 1;
  Ref<String> a = connectionTitle(), b = other.connectionTitle();
  if (a && b) return caseInsensitiveCompare(*a, *b);
  return a ? -1 : 1;
}

std::string ConnectionInfo::description() const {
  return describe(connectionType_.get()) + " via " + describe(IOMURL_.get()) + " browsed by " +
         describe(PBMURL_.get());
}

}  // namespace qr
