// Printer browser module: a user-interface plug-in that finds and lists the
// printers of one connection type. It can be opened for its title alone, or
// fully, in which case it is handed the lookup dictionaries of its connection type
// through the callbacks record; the client's requests are forwarded to the
// plug-in's entries.
#pragma once

#include <quarrin/plugin.h>

#include <cstdint>

#include "modules/lookup_source.h"
#include "modules/module.h"
#include "values/array.h"
#include "values/string.h"

namespace qr {

// Status values of the browser operations.
enum : int32_t {
  kPBMNoLookupSpecs = -1,
  kPBMParamErr = -50,
  kPBMNotLoaded = -9540,
  kPBMNoList = -9542,
  kPBMNoHost = -30870,
  kPBMBadIndex = -30882,
  kPBMNoConnectionType = -30887,
};

constexpr uint32_t kPBMTitleOnlyFlags = 0x10;

class PBMModule final : public QuarrinModule {
 public:
  using QuarrinModule::loadPluginInterface;
  using QuarrinModule::QuarrinModule;
  ~PBMModule() override;

  UUID* typeID() const override;
  UUID* interfaceID() const override;

  // Opens the browser: flags 16 asks only for the title; anything else is a
  // full open that needs a non-empty lookup list from the host.
  int32_t loadPluginInterface(const String* connectionType, LookupListSource* pmHost, void* refCon,
                              uint32_t browserFlags, PMPrBrowserGetLookupSpecProc getLookupSpec,
                              PMPrBrowserSyncRequestProc syncRequest,
                              PMPrBrowserSelStatusProc selStatus, void* userPane,
                              QrStringRef* title);

  int32_t Prologue(uint32_t flags, QrStringRef* title, uint32_t* minH, uint32_t* minV,
                   uint32_t* maxH, uint32_t* maxV);
  int32_t Initialize(void* refCon, const PMPrBrowserCallbacks* callbacks, void* userPane,
                     uint32_t numLookupSpecs);
  int32_t Sync();
  int32_t GetSelectedPrinters(QrArrayRef* printers);
  int32_t Terminate(int32_t status);
  int32_t Resize(int16_t* rect) { return (void)rect, 0; }
  int32_t WorksetPrinters(const Array* printers) { return (void)printers, 0; }

  const Ref<String>& connectionType() const noexcept { return _connectionType; }
  void setConnectionType(Ref<String> type) { _connectionType = std::move(type); }
  void* refCon() const noexcept { return _refcon; }
  LookupListSource* pmHost() const noexcept { return _pmHost; }
  const PMPrBrowserCallbacks* browserCallbacks() const noexcept { return _browserCallbacks; }

  // The host's lookup function: refCon is the module given to Initialize.
  static int32_t defaultGetLookupSpec(void* refCon, uint32_t index, QrDictionaryRef* lookupSpec);

 protected:
  // Browsers are hosted by library users in their own process.
  PluginRunner& runner() const override { return PluginRunner::inProcess(); }

 private:
  const QrBrowserModuleVTbl* table() const noexcept {
    return interfaceLoaded() ? static_cast<const QrBrowserModuleVTbl*>(pluginInterface()) : nullptr;
  }
  // Runs a plug-in entry under the guard; a raised platform exception is
  // logged and reported as kPBMNotLoaded.
  template <class Call>
  int32_t callEntry(const char* name, Call&& call);

  Ref<String> _connectionType;
  PMPrBrowserCallbacks* _browserCallbacks = nullptr;
  uint32_t _browserContext = 0;
  void* _refcon = nullptr;
  LookupListSource* _pmHost = nullptr;
};

}  // namespace qr
