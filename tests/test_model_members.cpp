// The model-semantics members: which page OnProperties opens for an item,
// the stereotype lists and where their file lies, class-diagram expansion.
#include <gtest/gtest.h>

#include <algorithm>

#include "addin/api.h"
#include "automation/collection.h"
#include "fakes.h"
#include "model/stereotype_config.h"
#include "shared/host_ids.h"
#include "shared/shared_registryapi2.h"

namespace kpx {
namespace {

using test::ErrorNumberOf;
using test::FakeObject;
using Args = std::span<Variant>;

// Another wrapper of the same object, as COM hands out for each call that
// returns it: a different Object, the same identity.
class Wrapper final : public Object {
 public:
  explicit Wrapper(ObjectPtr inner) : inner_(std::move(inner)) {}
  DispId IdOfName(std::string_view name) override { return inner_->IdOfName(name); }
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) override { return inner_->Invoke(id, kind, args); }
  const void* Identity() override { return inner_->Identity(); }

 private:
  ObjectPtr inner_;
};

// Counts name look-ups: each is a round trip to the host.
class NamedObject final : public FakeObject {
 public:
  using FakeObject::FakeObject;
  DispId IdOfName(std::string_view name) override {
    ++lookUps;
    return FakeObject::IdOfName(name);
  }
  int lookUps = 0;
};

constexpr DispId kRole1 = 901, kRole2 = 902, kAssociation = 903, kStart = 904;
constexpr const char* kCompProperties = "{CFD996E3-1393-11D3-B9F3-006008BF3ACB}";
constexpr const char* kLangProperties = "{05D99488-AB9F-11D2-B9EB-006008BF3ACB}";

std::shared_ptr<NamedObject> Element(const std::string& label, const std::string& kind, test::Journal* j) {
  auto e = std::make_shared<NamedObject>(label, j);
  e->On(hostid::kIdentifyClass, "IdentifyClass", [kind](Args) -> Variant { return kind; });
  return e;
}

class ModelMembersTest : public ::testing::Test {
 protected:
  ModelMembersTest() {
    j = &world.journal;
    app = std::make_shared<FakeObject>("app", j);
    vc = std::make_shared<FakeObject>("vc", j);
    auto manager = std::make_shared<FakeObject>("manager", nullptr);
    auto addIns = std::make_shared<FakeObject>("addins", nullptr);
    addIns->On(hostid::kCount, "Count", [](Args) -> Variant { return int16_t{1}; })
        .On(hostid::kGetAt, "GetAt", [this](Args) -> Variant { return ObjectPtr(vc); });
    manager->On(hostid::kAddIns, "AddIns", [addIns](Args) -> Variant { return ObjectPtr(addIns); });
    app->On(hostid::kAddInManager, "AddInManager", [manager](Args) -> Variant { return ObjectPtr(manager); })
        .On(hostid::kWriteErrorLog, "WriteErrorLog", nullptr)
        .On(hostid::kCurrentModel, "CurrentModel", [this](Args) -> Variant { return ObjectPtr(model); });
    vc->On(hostid::kAddInName, "Name", [this](Args) -> Variant { return addInName; })
        .On(hostid::kInstallDirectory, "InstallDirectory", [this](Args) -> Variant { return installDirectory; })
        .On(hostid::kRegistryRoot, "RegistryRoot", [](Args) -> Variant { return "SOFTWARE\\Quarn\\VC"; });

    assistant = std::make_shared<FakeObject>("assistant", j);
    assistant->On(kStart, "StartModelAssistant", [this](Args a) -> Variant {
      started.assign(a.begin(), a.end());
      for (Variant& v : started) v = v.deref();
      if (replacement) a[0].assign(Variant(replacement));
      return assistantAnswer;
    });
    world.factory.makers["kpxModelAssist.API"] = [this] { return ObjectPtr(assistant); };
    world.factory.makers[kCompProperties] = [this] {
      auto c = std::make_shared<FakeObject>("comp", j);
      c->On(3, "ShowComponentOptions", [](Args) -> Variant { return true; }).Operation(3, 3);
      return ObjectPtr(c);
    };
    world.factory.makers[kLangProperties] = [this] {
      auto c = std::make_shared<FakeObject>("lang", j);
      c->On(1, "ShowProperties", [](Args a) -> Variant { return a[1].toInt32() == 2; });
      return ObjectPtr(c);
    };
    world.registry.CreateKey(RootKey::LocalMachine, kDebugSettingsKey);
    RegistrySetValue(world.registry, RootKey::LocalMachine, kDebugSettingsKey, "Debug", Variant(0x7F000080),
                     platform::kRegDword);
    RegistrySetValue(world.registry, RootKey::LocalMachine, kDebugSettingsKey, "SuppressTimeStamps",
                     Variant("true"), platform::kRegSz);
    api = CreateApi(module);
    ObjectPtr a = app;
    // Activation's own work is not what these tests look at; the host here
    // offers too little for it, and it absorbs every failure.
    api->OnActivate(a);
    j->clear();
    Log().clear();
  }
  std::string& Log() { return world.files.at("C:\\tzndebuglog.txt"); }
  bool Properties(const Variant& item, const Variant& context = Variant()) { return api->OnProperties(item, context); }
  void StereotypeFile(const std::string& value) {
    world.registry.CreateKey(RootKey::LocalMachine, "SOFTWARE\\Quarn\\VC");
    RegistrySetValue(world.registry, RootKey::LocalMachine, "SOFTWARE\\Quarn\\VC", "StereotypeCfgFile", Variant(value),
                     platform::kRegSz);
  }

  test::World world;
  test::Journal* j = nullptr;
  platform::Platform platform = world.platform();
  Module module{platform};
  std::shared_ptr<FakeObject> app, vc, model, assistant;
  std::string addInName = "VC++";
  std::string installDirectory = "C:\\Quarn\\vc";
  std::vector<Variant> started;
  Variant assistantAnswer = true;
  ObjectPtr replacement;
  std::shared_ptr<API> api;
};

TEST_F(ModelMembersTest, WithoutAnItemTheLanguagePagesOpenAtTheAskedPageBelowThree) {
  EXPECT_TRUE(Properties(Variant(7), Variant(2)));        // the fake pages answer True for page 2 only
  EXPECT_FALSE(Properties(Variant("text"), Variant(5)));  // page 0
  EXPECT_FALSE(Properties(Variant()));                    // omitted context: page 0
  EXPECT_TRUE(Properties(Variant(), Variant("2")));       // read as a number, as VB compares it
  EXPECT_FALSE(Properties(Variant(), Variant::Null()));   // Null is never below 3: page 0
  EXPECT_EQ(vberr::kTypeMismatch, ErrorNumberOf([&] { Properties(Variant(), Variant("two")); }));
  EXPECT_EQ(std::count(world.factory.created.begin(), world.factory.created.end(), kLangProperties), 1)
      << "the pages are made once and kept";
  EXPECT_EQ(Log().find(" TRACE    ADDIN     kpxAddin.OnProperties(anItem, Optional aContext)\r\n"
                       " TRACE    ADDIN     kpxAddin.QuarnApp()\r\n"),
            0u);
  // Nothing is an object reference: asking it for its kind fails, to the host.
  EXPECT_EQ(vberr::kObjectNotSet, ErrorNumberOf([&] { Properties(Variant::Nothing()); }));
}

TEST_F(ModelMembersTest, EachKindOpensItsPageWithTheClassAndTheItem) {
  auto cls = Element("cls", "Class", j);
  auto module = Element("module", "Module", j);
  auto op = Element("op", "Operation", j);
  auto attr = Element("attr", "Attribute", j);
  auto has = Element("has", "HasRelation", j);
  op->On(hostid::kOperationParentClass, "ParentClass", [cls](Args) -> Variant { return ObjectPtr(cls); });
  attr->On(hostid::kAttributeParentClass, "ParentClass", [cls](Args) -> Variant { return ObjectPtr(cls); });
  has->On(hostid::kGetClient, "GetClient", [cls](Args) -> Variant { return ObjectPtr(cls); });

  EXPECT_TRUE(Properties(Variant(ObjectPtr(module))));
  EXPECT_EQ(world.journal, (test::Journal{"module.IdentifyClass", "comp.ShowComponentOptions <obj>"}));
  EXPECT_TRUE(world.factory.created.back() == kCompProperties);
  EXPECT_EQ(Log().find("OnProperties: Calling ModelAssistant."), std::string::npos);

  struct Case {
    ObjectPtr item;
    ObjectPtr shown;  // the assistant's third argument
  };
  for (const Case& c : {Case{cls, nullptr}, Case{op, op}, Case{attr, attr}, Case{has, has}}) {
    started.clear();
    EXPECT_TRUE(Properties(Variant(c.item)));
    ASSERT_EQ(started.size(), 3u);
    EXPECT_EQ(started[0], Variant(ObjectPtr(app)));
    EXPECT_EQ(started[1], Variant(ObjectPtr(cls)));
    EXPECT_TRUE(started[2].isObject());
    EXPECT_EQ(started[2].objectOrNull(), c.shown);
  }
  // The assistant's answer is the result; the application it hands back is kept.
  assistantAnswer = Variant();
  replacement = std::make_shared<FakeObject>("other app", nullptr);
  EXPECT_FALSE(Properties(Variant(ObjectPtr(cls))));
  EXPECT_EQ(api->QuarnApp(), replacement);
  EXPECT_NE(Log().find(" TRACE    ADDIN     kpxAddin.ModelAssistantAPI()\r\n"
                       " TRACE    ADDIN     kpxAddin.OnProperties: Calling ModelAssistant.\r\n"),
            std::string::npos);
}

TEST_F(ModelMembersTest, KindsAreComparedExactlyAndOthersAreUnknown) {
  for (const char* kind : {"Association", "class", "Role ", ""}) {
    Log().clear();
    world.factory.created.clear();
    EXPECT_FALSE(Properties(Variant(ObjectPtr(Element("x", kind, j)))));
    EXPECT_NE(Log().find(std::string(" ERROR    ADDIN     kpxAddin.OnProperties: Unknown type '") + kind + "'. \r\n"),
              std::string::npos);
    EXPECT_TRUE(world.factory.created.empty()) << "no assistant for " << kind;
  }
}

TEST_F(ModelMembersTest, ARoleShowsTheClassAcrossItsAssociationToldByIdentity) {
  auto classA = Element("A", "Class", j), classB = Element("B", "Class", j);
  auto r1 = Element("r1", "Role", j), r2 = Element("r2", "Role", j);
  auto association = std::make_shared<NamedObject>("assoc", j);
  r1->On(hostid::kGetSupplier, "GetSupplier", [classA](Args) -> Variant { return ObjectPtr(classA); });
  r2->On(hostid::kGetSupplier, "GetSupplier", [classB](Args) -> Variant { return ObjectPtr(classB); });
  // Weak references: roles and their association refer to each other.
  std::weak_ptr<NamedObject> weakAssociation = association, weakR1 = r1, weakR2 = r2;
  for (const auto& r : {r1, r2})
    r->On(kAssociation, "Association", [=](Args) -> Variant { return ObjectPtr(weakAssociation.lock()); });
  // The host hands out a fresh wrapper each time: only identity tells r1.
  association->On(kRole1, "Role1", [=](Args) -> Variant { return ObjectPtr(std::make_shared<Wrapper>(weakR1.lock())); })
      .On(kRole2, "Role2", [=](Args) -> Variant { return ObjectPtr(std::make_shared<Wrapper>(weakR2.lock())); });

  EXPECT_TRUE(Properties(Variant(ObjectPtr(r1))));
  EXPECT_EQ(started[1], Variant(ObjectPtr(classB)));
  EXPECT_EQ(started[2].objectOrNull(), r1);
  EXPECT_EQ(association->calls, 2) << "Role1, then Role2";

  association->calls = 0;
  EXPECT_TRUE(Properties(Variant(ObjectPtr(r2))));
  EXPECT_EQ(started[1], Variant(ObjectPtr(classA)));
  EXPECT_EQ(association->calls, 1) << "Role1 is the other role: Role2 is not asked for";
  // Each name is looked up once: every role and association answers it with one id.
  EXPECT_EQ(association->lookUps, 2);
  EXPECT_EQ(r1->lookUps + r2->lookUps, 1);
}

TEST_F(ModelMembersTest, AnAssistantThatCannotBeMadeIsLoggedAndAFailingOneRaises) {
  world.factory.makers.erase("kpxModelAssist.API");
  auto cls = Element("cls", "Class", j);
  EXPECT_FALSE(Properties(Variant(ObjectPtr(cls))));
  EXPECT_NE(Log().find(" ERROR    ADDIN     kpxAddin.OnProperties: Call failed. ActiveX component can't create object\r\n"),
            std::string::npos);

  world.factory.makers["kpxModelAssist.API"] = [this] { return ObjectPtr(assistant); };
  assistant->On(kStart, "StartModelAssistant", [](Args) -> Variant { throw AutomationError(5, "no class"); });
  EXPECT_EQ(5, ErrorNumberOf([&] { Properties(Variant(ObjectPtr(cls))); }));
  EXPECT_EQ(api->QuarnApp(), app) << "nothing came back from a failed call";
  auto lost = Element("op", "Operation", j);  // no parent class member
  EXPECT_EQ(vberr::kNoSuchMember, ErrorNumberOf([&] { Properties(Variant(ObjectPtr(lost))); }));
}

// ------------------------------------------------------------------ expansion

// A class that answers its clients and suppliers, each time in new wrappers.
std::shared_ptr<NamedObject> RelatedClass(const std::string& label, test::Journal* j,
                                          std::vector<ObjectPtr>* clients = nullptr,
                                          std::vector<ObjectPtr>* suppliers = nullptr) {
  auto c = Element(label, "Class", j);
  auto listed = [](std::vector<ObjectPtr>* items) {
    return [items](Args) -> Variant {
      auto list = std::make_shared<Collection>();
      if (items)
        for (const ObjectPtr& o : *items) list->Add(Variant(ObjectPtr(std::make_shared<Wrapper>(o))));
      return ObjectPtr(list);
    };
  };
  c->On(910, "GetClientClasses", listed(clients)).On(911, "GetSupplierClasses", listed(suppliers));
  return c;
}

TEST_F(ModelMembersTest, ExpansionAddsEachRelatedClassOnceClientsFirst) {
  auto base = RelatedClass("base", j), user = RelatedClass("user", j), peer = RelatedClass("peer", j);
  std::vector<ObjectPtr> clientsOfA{user, peer}, suppliersOfA{base, user};
  std::vector<ObjectPtr> clientsOfB{ObjectPtr()}, suppliersOfB{base};
  auto a = RelatedClass("A", j, &clientsOfA, &suppliersOfA);
  auto b = RelatedClass("B", j, &clientsOfB, &suppliersOfB);
  clientsOfB[0] = a;  // a selected class is on the diagram already
  auto note = Element("note", "Note", j);
  std::vector<ObjectPtr> selection{a, note, b};
  std::vector<std::string> added;
  auto diagram = std::make_shared<NamedObject>("diagram", j);
  diagram->On(920, "AddClass", [&](Args x) -> Variant {
    auto* fake = dynamic_cast<const FakeObject*>(static_cast<const Object*>(x[0].toObject()->Identity()));
    added.push_back(fake ? fake->label() : "?");
    return added.back() != "peer";  // the diagram shows "peer" already
  });
  model = std::make_shared<FakeObject>("model", j);
  model->On(hostid::kGetSelectedItems, "GetSelectedItems", [&](Args) -> Variant {
          auto list = std::make_shared<Collection>();
          for (const ObjectPtr& o : selection) list->Add(Variant(o));
          return ObjectPtr(list);
        })
      .On(930, "GetActiveDiagram", [&](Args) -> Variant { return ObjectPtr(diagram); });

  std::string both = "CClass_ExpandBoth";
  ObjectPtr host = app;
  EXPECT_FALSE(api->OnSelectedContextMenuItem(host, both));
  EXPECT_EQ(added, (std::vector<std::string>{"user", "peer", "base"}));
  EXPECT_NE(Log().find(" TRACE    ADDIN     kpxAddin.ExpandClassDiagram: 2 classes added.\r\n"), std::string::npos);
  EXPECT_EQ(std::count(j->begin(), j->end(), "note.GetClientClasses"), 0) << "only classes are expanded";
  EXPECT_EQ(std::count(j->begin(), j->end(), "model.GetActiveDiagram"), 1) << "one look serves both";
  EXPECT_EQ(diagram->lookUps, 1);

  added.clear();
  std::string suppliers = "CClass_ExpandSuppliers";
  EXPECT_FALSE(api->OnSelectedContextMenuItem(host, suppliers));
  EXPECT_EQ(added, (std::vector<std::string>{"base", "user"}));
}

TEST_F(ModelMembersTest, AHostThatCannotExpandIsReportedOtherFailuresGoBack) {
  auto a = RelatedClass("A", j);
  model = std::make_shared<FakeObject>("model", j);
  model->On(hostid::kGetSelectedItems, "GetSelectedItems", [&](Args) -> Variant {
    auto list = std::make_shared<Collection>();
    list->Add(Variant(ObjectPtr(a)));
    return ObjectPtr(list);
  });
  std::string clients = "CClass_ExpandClients";
  ObjectPtr host = app;
  EXPECT_FALSE(api->OnSelectedContextMenuItem(host, clients));
  EXPECT_EQ(j->back(), "app.WriteErrorLog T5080");
  EXPECT_NE(Log().find(" ERROR    ADDIN     kpxAddin.ExpandClassDiagram: Object doesn't support this property or method"),
            std::string::npos);

  // No diagram open: said so, nothing else asked.
  model->On(930, "GetActiveDiagram", [](Args) -> Variant { return Variant::Nothing(); });
  EXPECT_FALSE(api->OnSelectedContextMenuItem(host, clients));
  EXPECT_EQ(j->back(), "app.WriteErrorLog T5081");

  model->On(930, "GetActiveDiagram", [](Args) -> Variant { throw AutomationError(vberr::kSubscript); });
  j->clear();
  EXPECT_EQ(vberr::kSubscript, ErrorNumberOf([&] { api->OnSelectedContextMenuItem(host, clients); }));
  EXPECT_EQ(std::count(j->begin(), j->end(), "app.WriteErrorLog T5080"), 0);
}

// ---------------------------------------------------------------- stereotypes

TEST(StereotypeFile, LinesEndAtLfWithOrWithoutCr) {
  using V = std::vector<std::string_view>;
  EXPECT_EQ(TextLines(""), V{});
  EXPECT_EQ(TextLines("a\r\nb\nc"), (V{"a", "b", "c"}));
  EXPECT_EQ(TextLines("a\n"), V{"a"});
  EXPECT_EQ(TextLines("\n\r\n"), (V{"", ""}));
  EXPECT_EQ(TextLines("a\rb\r\r\n"), (V{"a\rb\r"})) << "a CR alone ends no line";
}

TEST(StereotypeFile, OnlyWholeLinesOfTheWantedSectionCount) {
  const std::string file =
      "Stereotype=before any section\r\n"
      "Item=Class\r\n"
      "Stereotype= atlobject \r\n"
      " Stereotype=indented\r\n"
      "stereotype=lower case\r\n"
      "Stereotype=a=b\r\n"
      "Stereotype=\r\n"
      "Stereotype=\ttabbed\t\r\n"
      " Item=Component\r\n"
      "Stereotype=still class\r\n"
      "Item=Package\r\n"
      "Stereotype=package\r\n"
      "Item=Classes\r\n"
      "Stereotype=not class\r\n"
      "Item=Component\r\n"
      "Stereotype=DLL\r\n"
      "Item=Class\r\n"
      "Stereotype=atlobject\r\n"
      "Stereotype=coclass";
  using V = std::vector<std::string>;
  EXPECT_EQ(SectionStereotypes(file, kClassSection),
            (V{"atlobject", "a=b", "", "\ttabbed\t", "still class", "atlobject", "coclass"}));
  EXPECT_EQ(SectionStereotypes(file, kComponentSection), V{"DLL"});
  EXPECT_EQ(SectionStereotypes("Item=Class\nStereotype=x\n", kComponentSection), V{});
}

TEST_F(ModelMembersTest, TheStereotypeFileIsFoundThroughTheAddInAndTheRegistry) {
  auto list = [&](bool classes) { return classes ? api->ClassStereotypes() : api->ComponentStereotypes(); };
  // No value in the registry: no list, no file read.
  EXPECT_TRUE(list(true).isNothing());
  EXPECT_NE(Log().find(" TRACE    ADDIN     kpxAddin.ClassStereotypes()\r\n TRACE    ADDIN     kpxAddin.QuarnApp()\r\n"),
            std::string::npos);

  StereotypeFile("types\\vc.cfg");
  world.files.at("C:\\Quarn\\vc\\types\\vc.cfg") = "Item=Component\nStereotype=EXE\nStereotype=EXE\nItem=Class\n";
  j->clear();
  const Variant components = list(false);
  ASSERT_TRUE(components.isObject());
  auto* c = dynamic_cast<Collection*>(components.objectOrNull().get());
  ASSERT_NE(c, nullptr);
  ASSERT_EQ(c->size(), 2u);
  EXPECT_EQ(c->At(2), Variant("EXE"));
  EXPECT_EQ(j->back(), "read C:\\Quarn\\vc\\types\\vc.cfg");
  // A file without the section gives an empty list, not none.
  const Variant classes = list(true);
  ASSERT_FALSE(classes.isNothing());
  EXPECT_EQ(CallMethod(classes.toObject(), Collection::kCount).toInt32(), 0);

  // The file cannot be opened: the error goes to the host.
  world.files.files.clear();
  EXPECT_EQ(vberr::kFileNotFound, ErrorNumberOf([&] { list(true); }));
  world.files.folders.insert("c:\\quarn\\vc\\types\\vc.cfg");
  EXPECT_EQ(vberr::kPathFileAccess, ErrorNumberOf([&] { list(true); }));

  // No install directory: nothing else is asked for.
  installDirectory = "";
  j->clear();
  EXPECT_TRUE(list(true).isNothing());
  EXPECT_EQ(std::count(j->begin(), j->end(), "vc.InstallDirectory"), 1);
  EXPECT_EQ(std::count(j->begin(), j->end(), "vc.RegistryRoot"), 0);
  // No add-in "VC++": no list.
  installDirectory = "C:\\Quarn\\vc";
  addInName = "vc++";
  EXPECT_TRUE(list(false).isNothing());
}

TEST(StereotypeFile, ThePathIsJoinedAsItStands) {
  test::World world;
  auto addIn = std::make_shared<FakeObject>("addin", nullptr);
  std::string directory = "C:\\Quarn\\";
  addIn->On(hostid::kInstallDirectory, "InstallDirectory", [&](Args) -> Variant { return directory; })
      .On(hostid::kRegistryRoot, "RegistryRoot", [](Args) -> Variant { return "SOFTWARE\\VC"; });
  world.registry.CreateKey(RootKey::LocalMachine, "SOFTWARE\\VC");
  RegistrySetValue(world.registry, RootKey::LocalMachine, "SOFTWARE\\VC", "StereotypeCfgFile",
                   Variant("D:\\elsewhere\\s.cfg"), platform::kRegSz);
  EXPECT_EQ(StereotypeFilePath(world.registry, addIn), "C:\\Quarn\\\\D:\\elsewhere\\s.cfg");
  // Under HKEY_CURRENT_USER it is not looked for.
  world.registry.CreateKey(RootKey::CurrentUser, "SOFTWARE\\VC2");
  RegistrySetValue(world.registry, RootKey::CurrentUser, "SOFTWARE\\VC2", "StereotypeCfgFile", Variant("s.cfg"),
                   platform::kRegSz);
  addIn->On(hostid::kRegistryRoot, "RegistryRoot", [](Args) -> Variant { return "SOFTWARE\\VC2"; });
  EXPECT_EQ(StereotypeFilePath(world.registry, addIn), "");
}

}  // namespace
}  // namespace kpx
