// I/O module: serves one connection type and names the printer browser module
// that finds printers on it. Answers come from a current cache entry when
// there is one; otherwise the plug-in is asked once and the answer recorded.
#pragma once

#include "modules/module.h"
#include "values/string.h"

namespace qr {

class IOModule final : public QuarrinModule {
 public:
  using QuarrinModule::QuarrinModule;

  UUID* typeID() const override;
  UUID* interfaceID() const override;

  // Each runs connectionInfo() first while its field is empty; may still be null.
  Ref<String> connectionType();
  Ref<String> pbmPath();
  void connectionInfo();
  void setConnectionType(Ref<String> type) { _connectionType = std::move(type); }
  void setPBMPath(Ref<String> path) { _pbmPath = std::move(path); }

 private:
  Ref<String> _pbmPath;
  Ref<String> _connectionType;
};

}  // namespace qr
