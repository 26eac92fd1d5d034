// Collecting several packets into an aggregate and distributing it back.
#include <string>

#include <gtest/gtest.h>

#include "XMPTestUtil.h"

using namespace ovraxmp;
using xmptest::Get;
using xmptest::kTestNS;

namespace {

class XMPMultiFile : public ::testing::Test {
 protected:
  void SetUp() override {
    xmptest::RegisterTestNamespace();
    // Equal, differing, missing and structured values over three files.
    for (int i = 0; i < 3; ++i) {
      XMPMeta& m = mFiles[i];
      m.SetProperty(kTestNS, "Same", "equal");
      m.SetProperty(kTestNS, "Differs", i == 1 ? "other" : "value");
      if (i != 2) m.SetProperty(kTestNS, "Missing", "here");
      m.SetStructField(kTestNS, "Place", kTestNS, "City", "Bern");
      m.SetStructField(kTestNS, "Place", kTestNS, "Street", i == 0 ? "Main 1" : "Side 2");
      m.AppendArrayItem(kTestNS, "Ordered", kXMP_PropArrayIsOrdered, i == 2 ? "b" : "a");
      m.AppendArrayItem(kTestNS, "Ordered", 0, i == 2 ? "a" : "b");
      m.AppendArrayItem(kTestNS, "Bag", kXMP_PropValueIsArray, i == 2 ? "y" : "x");
      m.AppendArrayItem(kTestNS, "Bag", 0, i == 2 ? "x" : "y");
      m.SetProperty(kTestNS, "Qualified", "q");
      m.SetProperty(kTestNS, "Qualified/?ovt:Unit", i == 0 ? "mm" : "cm");
    }
  }

  XMPMeta Aggregate(int count) {
    XMPMeta target;
    for (int i = 0; i < count; ++i) XMPUtils::MultiFileCollect(&target, mFiles[i]);
    return target;
  }

  XMPMeta mFiles[3];
};

}  // namespace

TEST_F(XMPMultiFile, FirstCollectionCopiesEverythingAndCountsOne) {
  const XMPMeta target = Aggregate(1);
  EXPECT_EQ(Get(target, kXMP_NS_Transient, "MultiFileCount"), "1");
  EXPECT_EQ(Get(target, kTestNS, "Differs"), "value");
  EXPECT_EQ(Get(target, kTestNS, "Place/ovt:Street"), "Main 1");
  EXPECT_FALSE(target.IsMultiValued(kTestNS, "Differs"));
}

TEST_F(XMPMultiFile, DifferencesAreMarkedAndTheFirstValueKept) {
  const XMPMeta target = Aggregate(3);
  EXPECT_EQ(Get(target, kXMP_NS_Transient, "MultiFileCount"), "3");
  EXPECT_FALSE(target.IsMultiValued(kTestNS, "Same"));
  EXPECT_TRUE(target.IsMultiValued(kTestNS, "Differs"));
  EXPECT_EQ(Get(target, kTestNS, "Differs"), "value");
  EXPECT_TRUE(target.IsMultiValued(kTestNS, "Missing"));
  EXPECT_EQ(Get(target, kTestNS, "Missing"), "here");
  // Structures compare field by field.
  EXPECT_FALSE(target.IsMultiValued(kTestNS, "Place"));
  EXPECT_FALSE(target.IsMultiValued(kTestNS, "Place/ovt:City"));
  EXPECT_TRUE(target.IsMultiValued(kTestNS, "Place/ovt:Street"));
  // Order counts for ordered arrays only; qualifiers count.
  EXPECT_TRUE(target.IsMultiValued(kTestNS, "Ordered"));
  EXPECT_FALSE(target.IsMultiValued(kTestNS, "Bag"));
  EXPECT_TRUE(target.IsMultiValued(kTestNS, "Qualified"));
  // Marks stay in memory.
  EXPECT_EQ(xmptest::Serialize(target).find("MultiFileCount"), std::string::npos);
}

TEST_F(XMPMultiFile, PropertyOnlyInALaterFileIsMarked) {
  mFiles[1].SetProperty(kTestNS, "Late", "new");
  const XMPMeta target = Aggregate(2);
  EXPECT_TRUE(target.IsMultiValued(kTestNS, "Late"));
  EXPECT_FALSE(target.DoesPropertyExist(kTestNS, "Late"));
}

TEST_F(XMPMultiFile, DistributeWritesSingleValuedAndLeavesMultiValued) {
  XMPMeta aggregate = Aggregate(3);
  aggregate.SetProperty(kTestNS, "Same", "edited");
  aggregate.SetProperty(kTestNS, "Added", "everywhere");
  aggregate.SetStructField(kTestNS, "Place", kTestNS, "City", "Basel");
  // A deletion record, as the value layer writes it.
  aggregate.AppendArrayItem(kXMP_NS_Transient, "DeletedProperties", kXMP_PropValueIsArray, "",
                            kXMP_PropValueIsStruct);
  aggregate.SetStructField(kXMP_NS_Transient, "DeletedProperties[last()]", kXMP_NS_Transient, "DelURI", kTestNS);
  aggregate.SetStructField(kXMP_NS_Transient, "DeletedProperties[last()]", kXMP_NS_Transient, "DelPath",
                           "ovt:Missing");
  for (int i = 0; i < 3; ++i) {
    XMPMeta& member = mFiles[i];
    XMPUtils::MultiFileDistribute(aggregate, &member);
    EXPECT_EQ(Get(member, kTestNS, "Same"), "edited");
    EXPECT_EQ(Get(member, kTestNS, "Added"), "everywhere");
    EXPECT_EQ(Get(member, kTestNS, "Differs"), i == 1 ? "other" : "value");
    EXPECT_EQ(Get(member, kTestNS, "Place/ovt:City"), "Basel");
    EXPECT_EQ(Get(member, kTestNS, "Place/ovt:Street"), i == 0 ? "Main 1" : "Side 2");
    EXPECT_EQ(Get(member, kTestNS, "Ordered[1]"), i == 2 ? "b" : "a");
    EXPECT_FALSE(member.DoesPropertyExist(kTestNS, "Missing"));
    EXPECT_FALSE(member.DoesPropertyExist(kXMP_NS_Transient, "MultiFileCount"));
    EXPECT_FALSE(member.DoesPropertyExist(kXMP_NS_Transient, "DeletedProperties"));
  }
  // Collecting the distributed members again marks only what still differs.
  XMPMeta again;
  for (XMPMeta& member : mFiles) XMPUtils::MultiFileCollect(&again, member);
  EXPECT_FALSE(again.IsMultiValued(kTestNS, "Same"));
  EXPECT_FALSE(again.IsMultiValued(kTestNS, "Missing"));
  EXPECT_TRUE(again.IsMultiValued(kTestNS, "Differs"));
}

TEST_F(XMPMultiFile, ClearedMarkLetsDistributionWriteTheValue) {
  XMPMeta aggregate = Aggregate(3);
  aggregate.SetProperty(kTestNS, "Differs", "unified");
  aggregate.ClearMultiValueInfo(kTestNS, "Differs");
  for (XMPMeta& member : mFiles) {
    XMPUtils::MultiFileDistribute(aggregate, &member);
    EXPECT_EQ(Get(member, kTestNS, "Differs"), "unified");
  }
}
