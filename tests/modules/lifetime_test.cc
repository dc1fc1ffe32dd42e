// Values shared by the whole process survive a plug-in's extra releases, and
// lookup items live exactly as long as their list or a copy holds them.
#include <gtest/gtest.h>

#include "bundles/c_bridge.h"
#include "modules/lookup_info.h"
#include "modules/module_factory.h"
#include "values/boolean.h"
#include "values/uuid.h"

using namespace qr;

namespace {

TEST(SharedValues, OutliveExtraReleasesThroughTheCInterface) {
  using F = QuarrinModuleFactory;
  const std::vector<std::pair<UUID*, const char*>> ids = {
      {F::pmTypeID(), QR_PM_TYPE_ID},       {F::pmIntfID(), QR_PM_INTERFACE_ID},
      {F::iomTypeID(), QR_IOM_TYPE_ID},     {F::iomIntfID(), QR_IOM_INTERFACE_ID},
      {F::pbmTypeID(), QR_PBM_TYPE_ID},     {F::pbmVersID(), QR_PBM_VERSION_ID},
      {F::pbmIntfID(), QR_PBM_INTERFACE_ID}};
  std::vector<const Object*> shared = {fromC(QrBooleanGetTrue()), fromC(QrBooleanGetFalse()),
                                       String::empty().get()};
  for (const auto& id : ids) shared.push_back(id.first);
  for (const Object* value : shared)
    for (int i = 0; i < 4; ++i) QrRelease(toC(value));

  EXPECT_TRUE(Boolean::trueValue()->value());
  EXPECT_FALSE(Boolean::falseValue()->value());
  EXPECT_EQ(String::empty()->length(), 0u);
  for (const auto& [id, text] : ids) EXPECT_TRUE(id->isEqual(*UUID::fromString(text))) << text;
}

TEST(LookupInfo, ItemsGoWithTheLastHolderAndCopiesKeepThemReachable) {
  auto info = make<MutableDictionary>();
  info->set("Printer Browser Kind", String::make("laser"));
  auto list = make<LookupInfoList>(String::make("USB"));
  for (int i = 0; i < 3; ++i) list->addItem(make<LookupInfoItem>(nullptr, info.get()));
  make<LookupInfoItem>(nullptr, info.get());  // never added to a list
  LookupInfoItem* kept = list->getItemAtIndex(2);
  EXPECT_EQ(kept->retainCount(), 1u);  // the list's reference alone
  EXPECT_EQ(kept->lookupInfo()->get("PrBrowser Lookup Reference"), kept);

  Ref<Dictionary> copy = kept->copyLookupInfoDict();
  list->lookupList()->removeAt(0);  // leaves its list, and goes
  list.reset();
  auto* item = cast<LookupReference>(copy->get("PrBrowser Lookup Reference"));
  ASSERT_EQ(item, kept);
  EXPECT_TRUE(
      item->referencedLookupInfo()->get("Printer Browser Kind")->isEqual(*String::make("laser")));
}

}  // namespace
