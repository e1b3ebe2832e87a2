// The simulated host's objects: what they answer, what they record, and how
// calls into them are counted.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "shared/host_ids.h"
#include "sim/host_objects.h"
#include "fakes.h"
#include "test_sim_support.h"

namespace kpx::sim::test {
namespace {

namespace id = kpx::hostid;

using kpx::test::ErrorNumberOf;

const char* kWorld = R"({
  "application": {"path": "C:\\Quarn", "mainWindow": 77, "window": {"top": 1, "left": 2, "height": 3, "width": 4},
                  "failingScripts": {"C:\\bad.ebs": {"number": 1004, "description": "script failed"}}},
  "addins": [
    {"name": "VC++", "settings": {"Events": {"OnUser1": "C|Docs|Tools.DocGen"}},
     "helpFile": "C:\\Quarn\\vc.hlp", "menuStates": {"CClass_UpdateCode": true}},
    {"name": "Plain", "contextMenus": false,
     "eventHandler": {"members": {"OnGenerateCode": {"returns": 0}}}}
  ],
  "model": {
    "properties": {"VC++": {"Scripting": "False"}},
    "elements": [
      {"kind": "Module", "name": "Shapes", "language": "VC++"},
      {"kind": "Class", "name": "IShape", "stereotype": "interface", "language": "VC++", "components": ["Shapes"],
       "properties": {"VC++": {"ImplType": "dual"}}},
      {"kind": "Class", "name": "Circle", "stereotype": "coclass", "classKind": "Meta",
       "package": {"name": "Locked", "editable": false}, "operations": [{"name": "Draw"}]},
      {"kind": "Class", "name": "Inner", "nestedIn": "Circle"},
      {"kind": "Class", "name": "CCircle", "stereotype": "atlobject"},
      {"kind": "RealizeRelation", "name": "Circle->IShape", "client": "Circle", "supplier": "IShape"},
      {"kind": "DependencyRelation", "name": "CCircle->Circle", "client": "CCircle", "supplier": "Circle"},
      {"kind": "InheritRelation", "name": "i1", "client": "Circle", "supplier": "IShape", "relationText": "first"},
      {"kind": "InheritRelation", "name": "i2", "client": "Circle", "supplier": "Shapes"},
      {"kind": "Role", "name": "r1", "class": "Circle", "navigable": true},
      {"kind": "Role", "name": "r2", "class": "CCircle"},
      {"kind": "Association", "name": "a", "role1": "r1", "role2": "r2"}
    ],
    "selection": ["Circle", "IShape"],
    "diagram": {"name": "Main", "classes": ["Circle"]}
  }
})";

class SimWorldTest : public ::testing::Test {
 protected:
  SimWorld w{kWorld};
  ObjectPtr app() { return w.world().application(); }
  ObjectPtr element(const char* key) { return w.world().FindElement(key); }
  ObjectPtr addin(const char* name) { return w.world().FindAddIn(name); }
  std::string LabelOf(const Variant& v) { return w.log().Label(v.toObject().get()); }
};

TEST_F(SimWorldTest, EveryCallIntoAHostObjectCountsCompanionsDoNot) {
  const uint64_t start = w.log().hostCalls();
  ObjectPtr manager = GetObject(app(), id::kAddInManager);        // 1
  ObjectPtr addins = GetObject(manager, id::kAddIns);             // 2
  app()->IdOfName("GetMainWnd");                                  // 3
  EXPECT_THROW(app()->IdOfName("NoSuchThing"), AutomationError);  // 4: a failed lookup is a call too
  EXPECT_EQ(start + 4, w.log().hostCalls());
  ObjectPtr handler = CallByName(addin("Plain"), "EventHandler", CallKind::PropertyGet).toObject();  // 6
  CallByName(handler, "OnGenerateCode", CallKind::Method, {Variant(app())});  // companion: not counted
  EXPECT_EQ(start + 6, w.log().hostCalls());
}

TEST_F(SimWorldTest, CollectionsAreOneBasedAndGuardTheirEnds) {
  ObjectPtr addins = GetObject(GetObject(app(), id::kAddInManager), id::kAddIns);
  const Variant count = GetProperty(addins, id::kCount);
  EXPECT_EQ(VarType::Integer, count.type());
  EXPECT_EQ(2, count.toInt16());
  EXPECT_EQ("addin:VC++", LabelOf(CallMethod(addins, id::kGetAt, {Variant(int16_t{1})})));
  EXPECT_EQ("addin:Plain", LabelOf(CallMethod(addins, id::kGetAt, {Variant(int16_t{2})})));
  EXPECT_EQ(vberr::kSubscript, ErrorNumberOf([&] { CallMethod(addins, id::kGetAt, {Variant(int16_t{0})}); }));
  EXPECT_EQ(vberr::kSubscript, ErrorNumberOf([&] { CallMethod(addins, id::kGetAt, {Variant(int16_t{3})}); }));
  EXPECT_EQ(vberr::kOverflow, ErrorNumberOf([&] { CallMethod(addins, id::kGetAt, {Variant(40000)}); }));
  EXPECT_EQ(vberr::kWrongArgCount, ErrorNumberOf([&] { CallMethod(addins, id::kGetAt); }));
  // The host's add-in list cannot be changed; model collections can.
  EXPECT_EQ(vberr::kNoSuchMember, ErrorNumberOf([&] { addins->IdOfName("RemoveAll"); }));
  ObjectPtr selection = CallMethod(GetObject(app(), id::kCurrentModel), id::kGetSelectedItems).toObject();
  EXPECT_EQ("element:Circle", LabelOf(CallMethod(selection, id::kGetAt, {Variant(int16_t{1})})));
  CallByName(selection, "RemoveAll", CallKind::Method);
  CallByName(selection, "Add", CallKind::Method, {Variant(element("CCircle"))});
  EXPECT_EQ(1, GetProperty(selection, id::kCount).toInt16());
  // Each request gives a fresh collection: the model's selection is untouched.
  ObjectPtr again = CallMethod(GetObject(app(), id::kCurrentModel), id::kGetSelectedItems).toObject();
  EXPECT_EQ(2, GetProperty(again, id::kCount).toInt16());
}

TEST_F(SimWorldTest, AddInSettingsAreReadWithDefaultsAndWrittenBack) {
  ObjectPtr vc = addin("VC++");
  EXPECT_EQ("C|Docs|Tools.DocGen", CallMethod(vc, id::kReadSetting, {"events", "onuser1", ""}).toString());
  EXPECT_EQ("dflt", CallMethod(vc, id::kReadSetting, {"Events", "OnUser2", "dflt"}).toString());
  EXPECT_TRUE(CallMethod(vc, id::kWriteSetting, {"Events", "OnUser2", "M|x"}).toBool());
  EXPECT_EQ("M|x", CallMethod(vc, id::kReadSetting, {"Events", "OnUser2", ""}).toString());
  const std::vector<EventJson> reads = w.Events("setting-read");
  ASSERT_EQ(3u, reads.size());
  EXPECT_TRUE(reads[0]["found"].get<bool>());
  EXPECT_FALSE(reads[1]["found"].get<bool>());
  EXPECT_EQ("dflt", reads[1]["value"]);
  EXPECT_EQ("M|x", w.Events("setting-write").at(0)["value"]);
}

TEST_F(SimWorldTest, MenuEntriesStartAsTheModelSaysAndRecordTheExactValueWritten) {
  ObjectPtr vc = addin("VC++");
  ObjectPtr update =
      CallMethod(vc, id::kAddContextMenuItem, {Variant(int16_t{4}), "Update Code", "CClass_UpdateCode"}).toObject();
  ObjectPtr other =
      CallMethod(vc, id::kAddContextMenuItem, {Variant(int16_t{4}), "Browse", "CClass_Browse"}).toObject();
  // The same internal name on another menu is another entry.
  ObjectPtr componentUpdate =
      CallMethod(vc, id::kAddContextMenuItem, {Variant(int16_t{7}), "Update Code", "CClass_UpdateCode"}).toObject();
  EXPECT_EQ(Variant(true), CallByName(update, "MenuState", CallKind::PropertyGet));
  EXPECT_TRUE(CallByName(other, "menustate", CallKind::PropertyGet).isEmpty());
  PutProperty(other, other->IdOfName("MenuState"), Variant(int16_t{-1}));
  PutProperty(update, update->IdOfName("MenuState"), Variant(false));
  PutProperty(componentUpdate, componentUpdate->IdOfName("MenuState"), Variant(true));
  EXPECT_EQ(Variant(false), CallByName(update, "MenuState", CallKind::PropertyGet));
  const std::vector<EventJson> states = w.Events("menu-state");
  ASSERT_EQ(3u, states.size());
  EXPECT_EQ((EventJson{{"i2", -1}}), states[0]["value"]);  // an Integer is not a Boolean
  EXPECT_EQ(EventJson(false), states[1]["value"]);
  EXPECT_EQ("CClass_UpdateCode", states[1]["name"]);
  EXPECT_EQ(4, states[1]["itemType"]);
  EXPECT_EQ("CClass_UpdateCode", states[2]["name"]);
  EXPECT_EQ(7, states[2]["itemType"]);
  EXPECT_EQ(3u, w.Events("menu-add").size());
  // A host without context menus has no such member, by id or by name.
  EXPECT_EQ(vberr::kNoSuchMember, ErrorNumberOf([&] {
              CallMethod(addin("Plain"), id::kAddContextMenuItem, {Variant(int16_t{4}), "a", "b"});
            }));
  EXPECT_EQ(vberr::kNoSuchMember, ErrorNumberOf([&] { addin("Plain")->IdOfName("AddContextMenuItem"); }));
}

TEST_F(SimWorldTest, ApplicationAnswersAndRecordsItsEffects) {
  EXPECT_EQ("C:\\Quarn", GetProperty(app(), id::kApplicationPath).toString());
  EXPECT_EQ(Variant(77), CallByName(app(), "GetMainWnd", CallKind::Method));
  EXPECT_EQ(Variant(int16_t{3}), GetProperty(app(), id::kWindowHeight));
  PutProperty(app(), id::kWindowWidth, Variant(640));
  EXPECT_EQ(Variant(int16_t{640}), GetProperty(app(), id::kWindowWidth));
  CallMethod(app(), id::kWriteErrorLog, {"hello"});
  CallMethod(app(), id::kExecuteScript, {"C:\\good.ebs"});
  EXPECT_EQ(1004, ErrorNumberOf([&] { CallMethod(app(), id::kExecuteScript, {"c:\\BAD.ebs"}); }));
  EXPECT_EQ("hello", w.Events("hostlog").at(0)["text"]);
  const std::vector<EventJson> scripts = w.Events("script");
  ASSERT_EQ(2u, scripts.size());
  EXPECT_FALSE(scripts[0].contains("error"));
  EXPECT_EQ(1004, scripts[1]["error"]["number"]);
  EXPECT_EQ("Width", w.Events("element-write").at(0)["member"]);
  // Reads cannot be written, and methods want their arguments.
  EXPECT_EQ(vberr::kNoSuchMember, ErrorNumberOf([&] { PutProperty(app(), id::kApplicationPath, Variant("x")); }));
  EXPECT_EQ(vberr::kWrongArgCount, ErrorNumberOf([&] { CallMethod(app(), id::kWriteErrorLog); }));
}

TEST_F(SimWorldTest, OneDispIdMeansWhatTheObjectsKindMakesIt) {
  // 12608 on a relation is its client; on a role, the class at its end.
  EXPECT_EQ("element:Circle", LabelOf(CallMethod(element("Circle->IShape"), id::kGetClient)));
  EXPECT_EQ("element:IShape", LabelOf(CallMethod(element("Circle->IShape"), id::kGetSupplier)));
  EXPECT_EQ("element:CCircle", LabelOf(CallMethod(element("r2"), id::kGetClient)));
  EXPECT_EQ("element:CCircle", LabelOf(CallMethod(element("r2"), id::kGetSupplier)));
  // 434 belongs to attributes, 444 to operations; a class knows neither.
  EXPECT_EQ("element:Circle", LabelOf(GetProperty(element("Circle.Draw"), id::kOperationParentClass)));
  EXPECT_EQ("element:Circle", LabelOf(CallByName(element("Circle.Draw"), "ParentClass", CallKind::PropertyGet)));
  EXPECT_EQ(vberr::kNoSuchMember, ErrorNumberOf([&] { GetProperty(element("Circle.Draw"), id::kAttributeParentClass); }));
  EXPECT_EQ(vberr::kNoSuchMember, ErrorNumberOf([&] { CallMethod(element("Shapes"), id::kGetInheritRelations); }));
  EXPECT_EQ("VC++", GetProperty(element("Shapes"), id::kModuleLanguage).toString());
  EXPECT_EQ("Operation", CallMethod(element("Circle.Draw"), id::kIdentifyClass).toString());
  EXPECT_TRUE(CallMethod(element("Circle"), id::kIsKindOf, {"class"}).toBool());
  EXPECT_FALSE(CallMethod(element("Circle"), id::kIsKindOf, {"Module"}).toBool());
}

TEST_F(SimWorldTest, ClassQueriesFollowTheModel) {
  ObjectPtr circle = element("Circle");
  EXPECT_TRUE(CallMethod(element("Inner"), id::kIsNested).toBool());
  EXPECT_FALSE(CallMethod(circle, id::kIsNested).toBool());
  EXPECT_EQ("element:Circle", LabelOf(GetProperty(element("Inner"), id::kEnclosingClass)));
  EXPECT_TRUE(GetProperty(circle, id::kEnclosingClass).isNothing());
  EXPECT_EQ("Meta",
            CallByName(CallByName(circle, "ClassKind", CallKind::PropertyGet).toObject(), "Name", CallKind::PropertyGet)
                .toString());
  EXPECT_FALSE(CallMethod(CallMethod(circle, id::kGetClassKind).toObject(), id::kKindTest).toBool());
  EXPECT_TRUE(CallMethod(CallMethod(element("IShape"), id::kGetClassKind).toObject(), id::kKindTest).toBool());
  ObjectPtr components = CallMethod(element("IShape"), id::kGetAssignedComponents).toObject();
  EXPECT_EQ("element:Shapes", LabelOf(CallMethod(components, id::kGetAt, {Variant(int16_t{1})})));
  EXPECT_EQ("VC++", CallByName(element("IShape"), "GetAssignedLanguage", CallKind::Method).toString());
  // Related classes: 6 gives the realizing classes, 5 the depending ones.
  ObjectPtr realizing = CallByName(element("IShape"), "GetRelatedClasses", CallKind::Method, {0, 6}).toObject();
  ASSERT_EQ(1, GetProperty(realizing, id::kCount).toInt16());
  EXPECT_EQ("element:Circle", LabelOf(CallMethod(realizing, id::kGetAt, {Variant(int16_t{1})})));
  ObjectPtr depending = CallByName(circle, "GetRelatedClasses", CallKind::Method, {0, 5}).toObject();
  EXPECT_EQ("element:CCircle", LabelOf(CallMethod(depending, id::kGetAt, {Variant(int16_t{1})})));
  EXPECT_EQ(
      0,
      GetProperty(CallByName(circle, "GetRelatedClasses", CallKind::Method, {0, 6}).toObject(), id::kCount).toInt16());
}

TEST_F(SimWorldTest, DeletedInheritRelationsLeaveTheClass) {
  ObjectPtr circle = element("Circle");
  ObjectPtr inherits = CallMethod(circle, id::kGetInheritRelations).toObject();
  ASSERT_EQ(2, GetProperty(inherits, id::kCount).toInt16());
  EXPECT_EQ("first", GetProperty(element("i1"), id::kRelationText).toString());
  EXPECT_EQ("element:IShape", LabelOf(CallMethod(element("i1"), id::kGetSupplierClass)));
  EXPECT_TRUE(CallMethod(element("i2"), id::kGetSupplierClass).isNothing());  // a module is no class
  CallMethod(circle, id::kDeleteInheritRel, {Variant(element("i1"))});
  inherits = CallMethod(circle, id::kGetInheritRelations).toObject();
  ASSERT_EQ(1, GetProperty(inherits, id::kCount).toInt16());
  EXPECT_EQ("element:i2", LabelOf(CallMethod(inherits, id::kGetAt, {Variant(int16_t{1})})));
  // Neither a relation deleted before nor one of another class can be deleted.
  EXPECT_EQ(vberr::kInvalidCall, ErrorNumberOf([&] { CallMethod(circle, id::kDeleteInheritRel, {Variant(element("i1"))}); }));
  EXPECT_EQ(vberr::kInvalidCall,
            ErrorNumberOf([&] { CallMethod(element("IShape"), id::kDeleteInheritRel, {Variant(element("i2"))}); }));
  const EventJson write = w.Events("element-write").at(0);
  EXPECT_EQ("Circle", write["element"]);
  EXPECT_EQ((EventJson{{"object", "element:i1"}}), write["value"]);
}

TEST_F(SimWorldTest, AssociationsLeadFromOneEndToTheOther) {
  ObjectPtr a = element("a");
  EXPECT_EQ("element:r2", LabelOf(CallMethod(a, id::kGetOtherRole, {Variant(element("Circle"))})));
  EXPECT_EQ("element:r1", LabelOf(CallMethod(a, id::kGetOtherRole, {Variant(element("CCircle"))})));
  EXPECT_EQ(vberr::kInvalidCall, ErrorNumberOf([&] { CallMethod(a, id::kGetOtherRole, {Variant(element("IShape"))}); }));
  EXPECT_EQ("element:a", LabelOf(CallByName(element("r1"), "Association", CallKind::PropertyGet)));
  EXPECT_TRUE(GetProperty(element("r1"), id::kNavigable).toBool());
  EXPECT_FALSE(GetProperty(element("r2"), id::kNavigable).toBool());
  EXPECT_EQ("element:r2", LabelOf(CallByName(a, "Role2", CallKind::PropertyGet)));
}

TEST_F(SimWorldTest, PropertiesAndNamesChangeAndAreRecorded) {
  ObjectPtr shape = element("IShape");
  EXPECT_EQ("dual", CallMethod(shape, id::kGetPropertyValue, {"vc++", "implTYPE"}).toString());
  EXPECT_EQ("", CallMethod(shape, id::kGetPropertyValue, {"VC++", "Missing"}).toString());
  EXPECT_TRUE(CallMethod(shape, id::kFindProperty, {"VC++", "Missing"}).isNothing());
  ObjectPtr prop = CallMethod(shape, id::kFindProperty, {"VC++", "ImplType"}).toObject();
  EXPECT_EQ("dual", CallByName(prop, "Value", CallKind::PropertyGet).toString());
  EXPECT_FALSE(CallMethod(shape, id::kCreateProperty, {"VC++", "ImplType", "custom", "String"}).toBool());
  EXPECT_TRUE(CallMethod(shape, id::kCreateProperty, {"VC++", "Threading", "Apartment", "String"}).toBool());
  EXPECT_TRUE(CallMethod(shape, id::kOverrideProperty, {"VC++", "ImplType", "custom"}).toBool());
  EXPECT_EQ("custom", CallMethod(shape, id::kGetPropertyValue, {"VC++", "ImplType"}).toString());
  PutProperty(shape, id::kName, Variant("IFigure"));
  EXPECT_EQ("IFigure", GetProperty(shape, id::kName).toString());
  EXPECT_EQ("False",
            CallMethod(GetObject(app(), id::kCurrentModel), id::kGetPropertyValue, {"VC++", "Scripting"}).toString());
  const std::vector<EventJson> writes = w.Events("element-write");
  ASSERT_EQ(4u, writes.size());
  EXPECT_FALSE(writes[0]["created"].get<bool>());
  EXPECT_TRUE(writes[1]["created"].get<bool>());
  EXPECT_EQ("OverrideProperty", writes[2]["member"]);
  EXPECT_EQ("Name", writes[3]["member"]);
  EXPECT_EQ("IFigure", writes[3]["value"]);
  // The scenario still knows the element by its original name.
  EXPECT_NE(nullptr, w.world().FindElement("IShape"));
}

// Expansion's view of the model: a class's suppliers are the classes at the
// supplier end of its relations and across associations whose far role is
// navigable; its clients the other way round. Modules and the class itself
// never count, and each class comes once, in model order.
TEST_F(SimWorldTest, ClientsAndSuppliersFollowRelationsAndNavigableRoles) {
  auto labels = [&](const char* cls, const char* member) {
    ObjectPtr list = CallByName(element(cls), member, CallKind::Method).toObject();
    std::vector<std::string> out;
    for (int16_t i = 1; i <= GetProperty(list, id::kCount).toInt16(); ++i)
      out.push_back(LabelOf(CallMethod(list, id::kGetAt, {Variant(i)})));
    return out;
  };
  using L = std::vector<std::string>;
  EXPECT_EQ(labels("Circle", "GetSupplierClasses"), L{"element:IShape"});
  EXPECT_EQ(labels("Circle", "GetClientClasses"), L{"element:CCircle"});
  EXPECT_EQ(labels("CCircle", "GetSupplierClasses"), L{"element:Circle"});
  EXPECT_EQ(labels("CCircle", "GetClientClasses"), L{});
  EXPECT_EQ(labels("IShape", "GetClientClasses"), L{"element:Circle"});
  EXPECT_EQ(vberr::kNoSuchMember, ErrorNumberOf([&] { CallByName(element("Shapes"), "GetClientClasses", CallKind::Method); }));
}

TEST_F(SimWorldTest, TheActiveDiagramShowsEachClassOnceAndRecordsWhatIsAdded) {
  ObjectPtr model = GetObject(app(), id::kCurrentModel);
  ObjectPtr diagram = CallByName(model, "GetActiveDiagram", CallKind::Method).toObject();
  ASSERT_EQ("diagram:Main", w.log().Label(diagram.get()));
  EXPECT_EQ(diagram, CallByName(model, "GetActiveDiagram", CallKind::Method).toObject()) << "one diagram, kept";
  EXPECT_FALSE(CallByName(diagram, "AddClass", CallKind::Method, {Variant(element("Circle"))}).toBool());
  EXPECT_TRUE(CallByName(diagram, "AddClass", CallKind::Method, {Variant(element("IShape"))}).toBool());
  EXPECT_FALSE(CallByName(diagram, "AddClass", CallKind::Method, {Variant(element("IShape"))}).toBool());
  EXPECT_EQ(vberr::kInvalidCall,
            ErrorNumberOf([&] { CallByName(diagram, "AddClass", CallKind::Method, {Variant(element("Shapes"))}); }));
  const std::vector<EventJson> adds = w.Events("diagram-add");
  ASSERT_EQ(1u, adds.size());
  EXPECT_EQ("Main", adds[0]["diagram"]);
  EXPECT_EQ("IShape", adds[0]["class"]);

  SimWorld bare(R"({"model": {"elements": [{"kind": "Class", "name": "A"}], "diagramMembers": false}})");
  ObjectPtr bareModel = GetObject(bare.world().application(), id::kCurrentModel);
  EXPECT_EQ(vberr::kNoSuchMember, ErrorNumberOf([&] { bareModel->IdOfName("GetActiveDiagram"); }));
  EXPECT_EQ(vberr::kNoSuchMember, ErrorNumberOf([&] { bare.world().FindElement("A")->IdOfName("GetSupplierClasses"); }));
  SimWorld closed(R"({"model": {"elements": [{"kind": "Class", "name": "A"}]}})");
  EXPECT_TRUE(CallByName(GetObject(closed.world().application(), id::kCurrentModel), "GetActiveDiagram",
                         CallKind::Method).isNothing());
}

}  // namespace
}  // namespace kpx::sim::test
