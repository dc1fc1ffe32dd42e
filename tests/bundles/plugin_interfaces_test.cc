// The printer module and browser tables as a C plug-in fills them and a host
// calls them: the layouts of <quarrin/plugin.h> must agree across compilers.
#include <gtest/gtest.h>
#include <quarrin/plugin.h>

#include "bundles/c_bridge.h"
#include "fixtures/fixture_support.h"
#include "support/plugin_instance.h"
#include "values/array.h"
#include "values/dictionary.h"
#include "values/string.h"

using namespace qr;
using qr::test::fixtureBundle;
using qr::test::FixtureCalls;

namespace {

// Serves two lookup dictionaries; refCon must be the value handed to Initialize.
int32_t serveLookupSpec(void* refCon, uint32_t index, QrDictionaryRef* lookup) {
  if (refCon != &serveLookupSpec) return -9540;
  if (index >= 2) return -30882;
  auto d = make<MutableDictionary>();
  d->set("connectionType", String::make(index == 0 ? "USB" : "DNSSD"));
  *lookup = leakToC<QrDictionaryRef>(d);
  return 0;
}

}  // namespace

TEST(PlugInInterfaces, PrinterModuleHandsTheCallerANewArray) {
  auto* interface = static_cast<const QrPrinterModuleVTbl* const*>(qrtest::interfaceOf(
      fixtureBundle("c_pm"), FIXTURE_FACTORY_A, QR_PM_TYPE_ID, QR_PM_INTERFACE_ID));
  ASSERT_TRUE(interface);
  QrArrayRef answer = nullptr;
  (*interface)->CreateBrowserInfo(toC<QrStringRef>(String::make("USB").get()), &answer);
  // Adopting the answer releases it at the end: the sanitizer build reports
  // a leak if the plug-in handed out more than the caller's one reference.
  Ref<Array> info = adoptFromC<Array>(answer);
  ASSERT_TRUE(info);
  ASSERT_EQ(info->count(), 2u);
  auto* second = cast<Dictionary>(info->at(1));
  ASSERT_TRUE(second);
  EXPECT_EQ(describe(second->get("Printer Browser Kind")), "Fixture Laser 2");

  QrArrayRef none = nullptr;
  (*interface)->CreateBrowserInfo(toC<QrStringRef>(String::make("Quellnet").get()), &none);
  EXPECT_EQ(none, nullptr);
}

TEST(PlugInInterfaces, BrowserTableIsReachedDirectlyAndReadsTheCallbacksRecord) {
  FixtureCalls calls;
  auto* table = static_cast<const QrBrowserModuleVTbl*>(qrtest::interfaceOf(
      fixtureBundle("c_pbm"), FIXTURE_FACTORY_A, QR_PBM_TYPE_ID, QR_PBM_INTERFACE_ID));
  ASSERT_TRUE(table);

  uint32_t context = 0, minH = 0, minV = 0, maxH = 0, maxV = 0;
  QrStringRef title = nullptr;
  ASSERT_EQ(table->Prologue(&context, 1, &title, &minH, &minV, &maxH, &maxV), 0);
  EXPECT_EQ(context, 0x5157u);
  EXPECT_EQ(adoptFromC<String>(title)->utf8(), "Fixture Browser");
  EXPECT_EQ(maxV, 400u);

  PMPrBrowserCallbacks callbacks{1, serveLookupSpec, nullptr, nullptr};
  EXPECT_EQ(
      table->Initialize(context, reinterpret_cast<void*>(&serveLookupSpec), &callbacks, nullptr, 3),
      0);
  EXPECT_EQ(table->Terminate(context, -128), 0);
  for (const char* line : {"c_pbm Initialize context=20823 ",
                           "c_pbm lookupSpec index=0 status=0 connectionType=USB count=1",
                           "c_pbm lookupSpec index=1 status=0 connectionType=DNSSD count=1",
                           "c_pbm lookupSpec index=2 status=-30882 connectionType=(null) count=0",
                           "c_pbm Terminate context=20823 status=-128"})
    EXPECT_EQ(calls.count(line), 1u) << line;
}
