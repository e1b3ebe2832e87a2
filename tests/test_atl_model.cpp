// The ATL model helpers and the element events' memory, on a small model in
// the simulated host: what the scenario goldens do not pin.
#include <gtest/gtest.h>

#include "addin/api.h"
#include "automation/collection.h"
#include "model/shared_modelutilities.h"
#include "sim/host_objects.h"
#include "test_sim_support.h"

namespace kpx::sim::test {
namespace {

const char* kModel = R"({
  "addins": [{"name": "VC++"}],
  "companions": [{"progid": "kpxatlassist.kpxatlAPI", "members": {"ImplementInterface": {}}}],
  "model": {
    "properties": {"VC++": {"Scripting": "False"}},
    "elements": [
      {"kind": "Class", "name": "IShape", "stereotype": "interface", "language": "VC++"},
      {"kind": "Class", "name": "ILonely", "stereotype": "interface", "language": "VC++"},
      {"kind": "Class", "name": "IA", "stereotype": "interface"},
      {"kind": "Class", "name": "IB", "stereotype": "interface"},
      {"kind": "Class", "name": "IC", "stereotype": "interface"},
      {"kind": "Class", "name": "IOne", "stereotype": "interface"},
      {"kind": "InheritRelation", "name": "One->A", "client": "IOne", "supplier": "IA"},
      {"kind": "InheritRelation", "name": "One->B", "client": "IOne", "supplier": "IB"},
      {"kind": "InheritRelation", "name": "One->C", "client": "IOne", "supplier": "IC"},
      {"kind": "Class", "name": "Shape", "stereotype": "CoClass", "language": "VC++"},
      {"kind": "Class", "name": "CShapeObj", "stereotype": "coclass,ATLObject", "language": "VC++"},
      {"kind": "RealizeRelation", "name": "Shape->IShape", "client": "Shape", "supplier": "IShape"},
      {"kind": "DependencyRelation", "name": "CShapeObj->Shape", "client": "CShapeObj", "supplier": "Shape"},
      {"kind": "Role", "name": "left", "class": "Shape"},
      {"kind": "Role", "name": "right", "class": "Shape"},
      {"kind": "Role", "name": "ahead", "class": "Shape", "navigable": true},
      {"kind": "Role", "name": "other", "class": "CShapeObj"},
      {"kind": "Association", "name": "self", "role1": "left", "role2": "right"},
      {"kind": "Association", "name": "self navigable", "role1": "ahead", "role2": "right"},
      {"kind": "Association", "name": "apart", "role1": "left", "role2": "other"}
    ]
  }
})";

class AtlModelTest : public ::testing::Test {
 protected:
  AtlModelTest() { w.sim().Create(); }
  ObjectPtr element(const char* key) { return w.world().FindElement(key); }
  std::string LabelOf(const ObjectPtr& o) { return w.log().Label(o.get()); }
  SimWorld w{kModel};
};

TEST_F(AtlModelTest, FindingEmptiesTheResultFirstAndMatchesStereotypesByToken) {
  auto result = std::make_shared<Collection>();
  result->Add(Variant(element("IShape")));
  FindAtlObjectClasses(element("ILonely"), result);
  EXPECT_EQ(result->size(), 0u) << "an interface no coclass realizes leaves the result empty, not as it was";

  // "CoClass" and "coclass,ATLObject" match as tokens, whatever their case.
  FindAtlObjectClasses(element("IShape"), result);
  ASSERT_EQ(result->size(), 1u);
  EXPECT_EQ(LabelOf(result->At(1).toObject()), "element:CShapeObj");
  FindCoclassAtlObjects(element("Shape"), result);
  ASSERT_EQ(result->size(), 1u);
  EXPECT_EQ(LabelOf(result->At(1).toObject()), "element:CShapeObj");
}

TEST_F(AtlModelTest, TheOtherRoleOfASelfAssociationIsRole1OnlyWhenNavigable) {
  EXPECT_EQ(LabelOf(FindOtherRole(element("self"), element("Shape"))), "element:right");
  EXPECT_EQ(LabelOf(FindOtherRole(element("self navigable"), element("Shape"))), "element:ahead");
  EXPECT_EQ(LabelOf(FindOtherRole(element("apart"), element("Shape"))), "element:other");
  EXPECT_EQ(LabelOf(FindOtherRole(element("apart"), element("CShapeObj"))), "element:left");
  // A class at neither end: the host refuses the first step, and nothing
  // is found rather than an error raised.
  EXPECT_EQ(FindOtherRole(element("apart"), element("IShape")), nullptr);
  EXPECT_EQ(FindOtherRole(nullptr, element("Shape")), nullptr);
}

TEST_F(AtlModelTest, ASilencedBaseInterfaceWarningDeletesWithoutAsking) {
  API& api = *w.sim().api();
  api.elementEvents().WarnMultipleInterfaceBase = false;
  api.OnNewModelElement(w.world().application(), element("One->C"));
  EXPECT_TRUE(w.Events("prompt").empty());
  const auto writes = w.Events("element-write");
  ASSERT_EQ(writes.size(), 2u);
  EXPECT_EQ(writes[0]["value"]["object"], "element:One->B");
  EXPECT_EQ(writes[1]["value"]["object"], "element:One->A");
}

TEST_F(AtlModelTest, TheAssistantIsMadeOnceAndTheWorkingCollectionIsLeftEmpty) {
  API& api = *w.sim().api();
  const ObjectPtr app = w.world().application();
  api.OnNewModelElement(app, element("Shape->IShape"));
  api.OnModifiedModelElement(app, element("IShape"), 0);
  EXPECT_EQ(w.Events("object-create").size(), 2u) << "the resource object and the assistant, each once";
  EXPECT_EQ(w.Events("companion-call").size(), 2u);
  ASSERT_NE(api.elementEvents().AtlObjectClasses, nullptr);
  EXPECT_EQ(api.elementEvents().AtlObjectClasses->size(), 0u);
}

}  // namespace
}  // namespace kpx::sim::test
