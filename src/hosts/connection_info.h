// A connection record: a connection type, the I/O module that serves it, and
// the printer browser module that finds printers on it, with the browser
// module's bundle identifier and display title derived on first request.
#pragma once

#include "values/object.h"
#include "values/string.h"
#include "values/url.h"

namespace qr {

class ConnectionInfo final : public Object {
 public:
  ConnectionInfo(Ref<String> connectionType, Ref<URL> IOMURL, Ref<URL> PBMURL);
  static Ref<ConnectionInfo> connectionInfoWithInfo(Ref<String> connectionType, Ref<URL> IOMURL,
                                                    Ref<URL> PBMMURL) {
    return make<ConnectionInfo>(std::move(connectionType), std::move(IOMURL), std::move(PBMMURL));
  }

  const Ref<String>& connectionType() const noexcept { return connectionType_; }
  const Ref<URL>& IOMURL() const noexcept { return IOMURL_; }
  const Ref<URL>& PBMURL() const noexcept { return PBMURL_; }

  // The browser module's bundle identifier ("" when no directory is there).
  Ref<String> connectionBundleID();
  // The display title: the browser module's own, else its bundle identifier.
  Ref<String> connectionTitle();
  // True for first-party browser modules ("com.varnex.print.pbm..." identifiers).
  bool PBMFromVarnex();
  // -1 when this record sorts first, 1 when the other does, 0 when equal.
  int compare(ConnectionInfo& other);

  void setConnectionType(Ref<String> v) { connectionType_ = std::move(v); }
  void setConnectionTitle(Ref<String> v) { connectionTitle_ = std::move(v); }
  void setConnectionBundleID(Ref<String> v) { connectionBundleID_ = std::move(v); }
  void setIOMURL(Ref<URL> v) { IOMURL_ = std::move(v); }
  void setPBMURL(Ref<URL> v) { PBMURL_ = std::move(v); }

  std::string description() const override;

 private:
  Ref<String> connectionType_;
  Ref<String> connectionTitle_;
  Ref<String> connectionBundleID_;
  Ref<URL> IOMURL_;
  Ref<URL> PBMURL_;
};

}  // namespace qr
