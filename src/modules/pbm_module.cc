#include "modules/pbm_module.h"

#include <cstdlib>

#include "bundles/c_bridge.h"
#include "modules/module_factory.h"
#include "modules/plugin_guard.h"
#include "platform/log.h"

namespace qr {

UUID* PBMModule::typeID() const { return QuarrinModuleFactory::pbmTypeID(); }
UUID* PBMModule::interfaceID() const { return QuarrinModuleFactory::pbmIntfID(); }

PBMModule::~PBMModule() { std::free(_browserCallbacks); }

template <class Call>
int32_t PBMModule::callEntry(const char* name, Call&& call) {
  int32_t status = kPBMNotLoaded;
  if (auto raised = guardPluginCall([&] { status = call(); })) {
    log("[%@] on call to '%@' for '%@'", *raised, name, pluginURL());
    return kPBMNotLoaded;
  }
  return status;
}

int32_t PBMModule::loadPluginInterface(const String* connectionType, LookupListSource* pmHost,
                                       void* refCon, uint32_t browserFlags,
                                       PMPrBrowserGetLookupSpecProc getLookupSpec,
                                       PMPrBrowserSyncRequestProc syncRequest,
                                       PMPrBrowserSelStatusProc selStatus, void* userPane,
                                       QrStringRef* title) {
  if (!loadPluginInterface()) return kPBMNotLoaded;
  setConnectionType(connectionType ? connectionType->copy() : nullptr);
  _refcon = refCon;
  _pmHost = pmHost;

  uint32_t minH, minV, maxH, maxV;
  if (browserFlags == kPBMTitleOnlyFlags) return Prologue(1, title, &minH, &minV, &maxH, &maxV);

  LookupInfoList* list =
      pmHost && connectionType ? pmHost->GetLookupInfoList(*connectionType) : nullptr;
  if (!list || list->maxIndex() == 0) return kPBMNoLookupSpecs;
  int32_t status = Prologue(browserFlags, title, &minH, &minV, &maxH, &maxV);
  if (status != 0) return status;
  // The first full open's record serves every later one unchanged.
  if (!_browserCallbacks) {
    _browserCallbacks =
        static_cast<PMPrBrowserCallbacks*>(std::calloc(1, sizeof(PMPrBrowserCallbacks)));
    if (_browserCallbacks) {
      _browserCallbacks->version = 1;
      _browserCallbacks->getLookupSpec = getLookupSpec ? getLookupSpec : &defaultGetLookupSpec;
      _browserCallbacks->syncRequest = syncRequest;
      _browserCallbacks->selStatus = selStatus;
    }
  }
  return Initialize(this, _browserCallbacks, userPane, list->maxIndex());
}

int32_t PBMModule::Prologue(uint32_t flags, QrStringRef* title, uint32_t* minH, uint32_t* minV,
                            uint32_t* maxH, uint32_t* maxV) {
  const QrBrowserModuleVTbl* t = table();
  if (!t || !t->Prologue) return kPBMNotLoaded;
  return callEntry("Prologue", [&] {
    return t->Prologue(&_browserContext, flags, title, minH, minV, maxH, maxV);
  });
}

int32_t PBMModule::Initialize(void* refCon, const PMPrBrowserCallbacks* callbacks, void* userPane,
                              uint32_t numLookupSpecs) {
  if (!interfaceLoaded()) return kPBMNotLoaded;
  const QrBrowserModuleVTbl* t = table();
  if (!t || !t->Initialize) {
    log("pbmInterface: 0x%08x && pbmInterface->initialize:0x%08x",
        static_cast<uint32_t>(reinterpret_cast<uintptr_t>(t)),
        static_cast<uint32_t>(reinterpret_cast<uintptr_t>(t ? t->Initialize : nullptr)));
    return kPBMNotLoaded;
  }
  return callEntry("Initialize", [&] {
    return t->Initialize(_browserContext, refCon, callbacks, userPane, numLookupSpecs);
  });
}

int32_t PBMModule::Sync() {
  const QrBrowserModuleVTbl* t = table();
  if (!t || !t->Sync) return kPBMNotLoaded;
  return callEntry("Sync", [&] { return t->Sync(_browserContext); });
}

int32_t PBMModule::GetSelectedPrinters(QrArrayRef* printers) {
  const QrBrowserModuleVTbl* t = table();
  if (!t || !t->GetSelectedPrinters) return kPBMNotLoaded;
  return callEntry("GetSelectedPrinters",
                   [&] { return t->GetSelectedPrinters(_browserContext, printers); });
}

int32_t PBMModule::Terminate(int32_t status) {
  const QrBrowserModuleVTbl* t = table();
  if (!t || !t->Terminate) return kPBMNotLoaded;
  return callEntry("Terminate", [&] { return t->Terminate(_browserContext, status); });
}

int32_t PBMModule::defaultGetLookupSpec(void* refCon, uint32_t index, QrDictionaryRef* lookupSpec) {
  if (!refCon || reinterpret_cast<uintptr_t>(refCon) == UINTPTR_MAX) return kPBMNotLoaded;
  if (!lookupSpec) return kPBMParamErr;
  *lookupSpec = nullptr;
  // Called from plug-in code: nothing may unwind through its frames.
  try {
    auto* module = static_cast<PBMModule*>(refCon);
    if (!module->connectionType()) return kPBMNoConnectionType;
    if (!module->pmHost()) return kPBMNoHost;
    LookupInfoList* list = module->pmHost()->GetLookupInfoList(*module->connectionType());
    if (!list) return kPBMNoList;
    if (index >= list->maxIndex()) return kPBMBadIndex;
    LookupInfoItem* item = list->getItemAtIndex(index);
    if (!item) return kPBMBadIndex;
    Ref<Dictionary> copy = item->copyLookupInfoDict();
    if (!copy) return kPBMNoList;
    *lookupSpec = leakToC<QrDictionaryRef>(std::move(copy));
    return 0;
  } catch (...) {
    return kPBMNoList;
  }
}

}  // namespace qr
