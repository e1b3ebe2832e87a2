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
      return assistantAnswer;
    });
    world.factory.makers["kpxModelAssist.API"] = [this] { return ObjectPtr(assistant); };
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

TEST_F(ModelMembersTest, AHostThatCannotExpandIsReportedOtherFailuresGoBack) {
  auto a = Element("A", "Class", j);
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

// Each step that cannot locate the file ends the search: no list, and
// nothing more asked of the host or read.
TEST_F(ModelMembersTest, AFileThatCannotBeLocatedGivesNoList) {
  auto list = [&] { return api->ClassStereotypes(); };
  EXPECT_TRUE(list().isNothing());  // no value in the registry
  EXPECT_NE(Log().find(" TRACE    ADDIN     kpxAddin.ClassStereotypes()\r\n TRACE    ADDIN     kpxAddin.QuarnApp()\r\n"),
            std::string::npos);
  EXPECT_EQ(std::count_if(j->begin(), j->end(), [](const std::string& e) { return e.rfind("read ", 0) == 0; }), 0);

  StereotypeFile("vc.cfg");
  world.files.at("C:\\Quarn\\vc\\vc.cfg") = "Item=Class\nStereotype=EXE\n";
  installDirectory = "";
  j->clear();
  EXPECT_TRUE(list().isNothing());
  EXPECT_EQ(std::count(j->begin(), j->end(), "vc.RegistryRoot"), 0);

  installDirectory = "C:\\Quarn\\vc";
  addInName = "vc++";  // the add-in's name differs in case: no add-in "VC++"
  j->clear();
  EXPECT_TRUE(list().isNothing());
  EXPECT_EQ(std::count(j->begin(), j->end(), "vc.InstallDirectory"), 0);
  addInName = "VC++";
  const Variant found = list();
  auto* c = dynamic_cast<Collection*>(found.objectOrNull().get());
  ASSERT_NE(c, nullptr);
  EXPECT_EQ(c->size(), 1u);
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
