// Commands reached from the menus and the host: IDE registration, user
// commands, forwarding to the sibling add-in, help.
#include <gtest/gtest.h>

#include "addin/api.h"
#include "fakes.h"
#include "shared/host_ids.h"
#include "shared/shared_registryapi2.h"

namespace kpx {
namespace {

using test::FakeObject;
using Args = std::span<Variant>;

constexpr const char* kIdeKey = "Software\\Microsoft\\DevStudio\\6.0\\AddIns\\kpxIDEAddin.DSAddIn";
constexpr const char* kIdeFile = "C:\\Quarn\\vc\\dlls\\kpxideaddin.dll";

// A host with the add-ins "VC++" and "VisualStudio"; everything journals.
class CommandTest : public ::testing::Test {
 protected:
  CommandTest() {
    test::Journal* j = &world.journal;
    app = std::make_shared<FakeObject>("app", j);
    vc = std::make_shared<FakeObject>("vc", j);
    vs = std::make_shared<FakeObject>("vs", j);
    handler = std::make_shared<FakeObject>("handler", j);
    auto manager = std::make_shared<FakeObject>("manager", nullptr);
    auto addIns = std::make_shared<FakeObject>("addins", nullptr);
    addIns->On(hostid::kCount, "Count", [this](Args) -> Variant { return int16_t(withSibling ? 2 : 1); })
        .On(hostid::kGetAt, "GetAt", [this](Args a) -> Variant { return ObjectPtr(a[0].toInt16() == 1 ? vc : vs); });
    manager->On(hostid::kAddIns, "AddIns", [addIns](Args) -> Variant { return ObjectPtr(addIns); });
    app->On(hostid::kAddInManager, "AddInManager", [manager](Args) -> Variant { return ObjectPtr(manager); })
        .On(hostid::kWriteErrorLog, "WriteErrorLog", nullptr)
        .On(hostid::kExecuteScript, "ExecuteScript", nullptr)
        .On(hostid::kApplicationPath, "ApplicationPath", [](Args) -> Variant { return "C:\\Quarn"; })
        .On(900, "GetMainWnd", [](Args) -> Variant { return 4242; });
    vc->On(hostid::kAddInName, "Name", [](Args) -> Variant { return "VC++"; })
        .On(hostid::kHelpFile, "HelpFile", [](Args) -> Variant { return "C:\\Quarn\\Help\\vc.hlp"; })
        .On(hostid::kReadSetting, "ReadSetting", [this](Args a) -> Variant {
          auto it = settings.find(a[1].toString());
          return it == settings.end() ? a[2].deref() : Variant(it->second);
        })
        .On(hostid::kAddContextMenuItem, "AddContextMenuItem", [](Args) -> Variant {
          auto entry = std::make_shared<FakeObject>("entry", nullptr);
          entry->On(1, "MenuState", nullptr);
          return ObjectPtr(entry);
        });
    vs->On(hostid::kAddInName, "Name", [](Args) -> Variant { return "VisualStudio"; })
        .On(800, "EventHandler", [this](Args) -> Variant { return ObjectPtr(handler); });
    handler->On(1, "OnGenerateCode", nullptr).On(2, "OnModelUpdate", nullptr);

    world.registry.CreateKey(RootKey::LocalMachine, kDebugSettingsKey);
    Reg(RootKey::LocalMachine, kDebugSettingsKey, "Debug", Variant(0x7F000080), platform::kRegDword);
    Reg(RootKey::LocalMachine, kDebugSettingsKey, "SuppressTimeStamps", Variant("true"), platform::kRegSz);
    const char* vcKey = "SOFTWARE\\Microsoft\\VisualStudio\\6.0\\Setup\\Microsoft Visual C++";
    world.registry.CreateKey(RootKey::LocalMachine, vcKey);
    Reg(RootKey::LocalMachine, vcKey, "ProductDir", Variant("C:\\VC98"), platform::kRegSz);
    world.files.at(kIdeFile) = "";
  }
  void Reg(RootKey root, std::string_view key, std::string_view name, const Variant& v, uint32_t type) {
    RegistrySetValue(world.registry, root, key, name, v, type);
  }
  std::string RegText(std::string_view name) {
    return RegistryQueryValue(world.registry, RootKey::CurrentUser, kIdeKey, name).toString();
  }
  std::string Log() { return world.files.at("C:\\tzndebuglog.txt"); }
  void Activate() {
    api = CreateApi(module);
    ObjectPtr a = app;
    api->OnActivate(a);
    world.journal.clear();
    world.files.at("C:\\tzndebuglog.txt").clear();
  }

  test::World world;
  platform::Platform platform = world.platform();
  Module module{platform};
  std::shared_ptr<FakeObject> app, vc, vs, handler;
  std::map<std::string, std::string> settings;
  bool withSibling = true;
  std::shared_ptr<API> api;
};

TEST_F(CommandTest, IdeAddInKeyIsCreatedOnceAndRepairedWhenSwitchedOff) {
  Activate();
  EXPECT_EQ(RegText(""), "1");
  EXPECT_EQ(RegText("DisplayName"), "Tolvek Quarn VC++ IDE");
  EXPECT_EQ(RegText("Description"), "IDE AddIn required for Round-Trip Engineering");
  EXPECT_EQ(RegText("Filename"), kIdeFile);

  // A name differing only in case counts as registered: nothing is written.
  Reg(RootKey::CurrentUser, kIdeKey, "Filename", Variant("c:\\QUARN\\VC\\dlls\\KPXIDEADDIN.DLL"), platform::kRegSz);
  Reg(RootKey::CurrentUser, kIdeKey, "Description", Variant("mine"), platform::kRegSz);
  Activate();
  EXPECT_EQ(RegText("Description"), "mine");
  EXPECT_EQ(RegText("Filename"), "c:\\QUARN\\VC\\dlls\\KPXIDEADDIN.DLL");

  // Switched off in Developer Studio: switched on again, display name kept.
  Reg(RootKey::CurrentUser, kIdeKey, "", Variant("0"), platform::kRegSz);
  Reg(RootKey::CurrentUser, kIdeKey, "DisplayName", Variant("My IDE add-in"), platform::kRegSz);
  Activate();
  EXPECT_EQ(RegText(""), "1");
  EXPECT_EQ(RegText("DisplayName"), "My IDE add-in");
  EXPECT_EQ(RegText("Description"), "IDE AddIn required for Round-Trip Engineering");
  EXPECT_EQ(RegText("Filename"), kIdeFile);
}

TEST_F(CommandTest, AMissingIdeAddInFileIsReportedAndTheAddInDeactivates) {
  vc->On(hostid::kDeactivate, "Deactivate", nullptr);
  world.files.files.clear();
  world.texts[1219] = "no IDE add-in file";
  api = CreateApi(module);
  ObjectPtr a = app;
  api->OnActivate(a);
  const test::Journal& j = world.journal;
  auto at = [&](const std::string& entry) { return std::find(j.begin(), j.end(), entry) - j.begin(); };
  EXPECT_LT(at("app.WriteErrorLog no IDE add-in file"), at("vc.Deactivate"));
  EXPECT_LT(at("vc.Deactivate"), static_cast<long>(j.size()));
  EXPECT_TRUE(RegistryQueryValue(world.registry, RootKey::CurrentUser, kIdeKey, "").isEmpty());
}

TEST_F(CommandTest, UserCommandDefinitionsBecomeEntriesAndObjectNames) {
  settings["OnUser1"] = "  CA | Generate docs | Tools.DocGen ";
  settings["OnUser2"] = "co|Lower case";
  settings["OnUser3"] = "C";
  settings["OnUser4"] = "x|Nowhere|";
  settings["OnUser5"] = "O|Pipes|A.B|C";
  api = CreateApi(module);
  ObjectPtr a = app;
  api->OnActivate(a);

  std::vector<std::string> userEntries;
  for (const std::string& e : world.journal)
    if (e.rfind("vc.AddContextMenuItem", 0) == 0 && (e.find(" U") != std::string::npos || e.find("Separator") != std::string::npos))
      userEntries.push_back(e.substr(22));
  // The catalogue's own eight separators come first.
  userEntries.erase(userEntries.begin(), userEntries.begin() + 8);
  EXPECT_EQ(userEntries, (std::vector<std::string>{
                             "4 Separator Separator", "4 Generate docs UClass_OnUser1", "5 Separator Separator",
                             "5 Generate docs UAttribute_OnUser1", "4 Lower case UClass_OnUser2",
                             "6 Separator Separator", "6 Lower case UOperation_OnUser2", "4 OnUser3 UClass_OnUser3",
                             "6 Pipes UOperation_OnUser5"}));
  EXPECT_EQ(api->userCommands(), (std::map<std::string, std::string, NoCaseLess>{{"OnUser1", "Tools.DocGen"},
                                                                                 {"OnUser2", "KORVA"},
                                                                                 {"OnUser3", ""},
                                                                                 {"OnUser4", "KORVA"},
                                                                                 {"OnUser5", "A.B|C"}}));
}

TEST_F(CommandTest, ChoosingUserEntriesRunsTheirObjectsAndReportsFailures) {
  settings["OnUser1"] = "C|Docs|Tools.DocGen";
  settings["OnUser2"] = "C|Korva";
  settings["OnUser3"] = "C";
  settings["OnUser4"] = "C|Broken|Tools.Broken";
  auto docGen = std::make_shared<FakeObject>("docgen", &world.journal);
  docGen->On(1, "OnUser1", nullptr);
  auto broken = std::make_shared<FakeObject>("broken", &world.journal);
  broken->On(4, "OnUser4", [](Args) -> Variant { throw AutomationError(5, "bad model"); });
  world.factory.makers["Tools.DocGen"] = [&] { return docGen; };
  world.factory.makers["Tools.Broken"] = [&] { return broken; };
  Activate();

  ObjectPtr a = app;
  auto choose = [&](std::string name) { return api->OnSelectedContextMenuItem(a, name); };
  EXPECT_FALSE(choose("UClass_OnUser1"));
  EXPECT_FALSE(choose("Anything_OnUser2"));  // the prefix does not matter
  EXPECT_FALSE(choose("UClass_OnUser3"));
  EXPECT_FALSE(choose("UClass_OnUser4"));
  EXPECT_FALSE(choose("UClass_OnUser9"));
  EXPECT_FALSE(choose(""));
  EXPECT_EQ(Log(),
            " TRACE    ADDIN     kpxAddin.OnSelectedContextMenuItem(QuarnApp, internalName)\r\n"
            " TRACE    ADDIN     BEGIN kpxAddin.OnUser1\r\n"
            " TRACE    ADDIN       END OnUser1()  OK\r\n"
            " TRACE    ADDIN     kpxAddin.OnSelectedContextMenuItem(QuarnApp, internalName)\r\n"
            " TRACE    ADDIN     BEGIN kpxAddin.OnUser2\r\n"
            " ERROR    ADDIN       OnUser2() CreateObject(KORVA) FAILED: ActiveX component can't create object\r\n"
            " TRACE    ADDIN     kpxAddin.OnSelectedContextMenuItem(QuarnApp, internalName)\r\n"
            " TRACE    ADDIN     BEGIN kpxAddin.OnUser3\r\n"
            " ERROR    ADDIN       OnUser3() FAILED: No ActiveX object name in registry\r\n"
            " TRACE    ADDIN     kpxAddin.OnSelectedContextMenuItem(QuarnApp, internalName)\r\n"
            " TRACE    ADDIN     BEGIN kpxAddin.OnUser4\r\n"
            " ERROR    ADDIN       END OnUser4() FAILED: bad model\r\n"
            " TRACE    ADDIN     kpxAddin.OnSelectedContextMenuItem(QuarnApp, internalName)\r\n"
            " TRACE    ADDIN     kpxAddin.OnSelectedContextMenuItem(QuarnApp, internalName)\r\n");
  std::vector<std::string> hostLog;
  for (const std::string& e : world.journal)
    if (e.rfind("app.WriteErrorLog", 0) == 0) hostLog.push_back(e.substr(18));
  EXPECT_EQ(hostLog, (std::vector<std::string>{
                         "  OnUser2() CreateObject(KORVA) FAILED: ActiveX component can't create object",
                         "  OnUser3() FAILED: No ActiveX object name in registry", "  END OnUser4() FAILED: bad model"}));
}

TEST_F(CommandTest, ModelUpdateFallsBackOnlyWhenTheSelectionUpdateIsMissing) {
  Activate();
  ObjectPtr a = app;
  api->OnModelUpdateSelection(a);
  EXPECT_EQ(world.journal, (test::Journal{"app.AddInManager", "vc.Name", "vs.Name", "vs.EventHandler",
                                          "handler.?OnModelUpdateSelection",
                                          "vs.EventHandler", "handler.OnModelUpdate <obj>"}));

  handler->On(3, "OnModelUpdateSelection", [](Args) -> Variant { throw AutomationError(5); });
  world.journal.clear();
  EXPECT_EQ(api->OnModelUpdateSelection(a), 0);
  EXPECT_EQ(world.journal, (test::Journal{"app.AddInManager", "vc.Name", "vs.Name", "vs.EventHandler",
                                          "handler.OnModelUpdateSelection <obj>"}));
  EXPECT_EQ(Log(), " TRACE    ADDIN     kpxAddin.OnModelUpdateSelection(QuarnApp).\r\n"
                   " TRACE    ADDIN     kpxAddin.StartModelUpdate(QuarnApp).\r\n"
                   " TRACE    ADDIN     kpxAddin.OnModelUpdateSelection(QuarnApp).\r\n"
                   " TRACE    ADDIN     kpxAddin.StartModelUpdate(QuarnApp).\r\n");
}

TEST_F(CommandTest, AssigningClassesFallsBackToTheAssignmentDialogOnlyWhenTheEventIsMissing) {
  handler->On(4, "OnComponentAssignment", nullptr);
  Activate();
  ObjectPtr a = app;
  EXPECT_EQ(api->OnAssignClasses(a), 0);
  EXPECT_EQ(world.journal, (test::Journal{"app.AddInManager", "vc.Name", "vs.Name", "vs.EventHandler",
                                          "handler.?OnAssignClasses", "handler.OnComponentAssignment <obj>"}));

  handler->On(5, "OnAssignClasses", [](Args) -> Variant { throw AutomationError(5, "no component"); });
  world.journal.clear();
  EXPECT_EQ(api->OnAssignClasses(a), 0);
  EXPECT_EQ(world.journal.back(), "handler.OnAssignClasses <obj>");
  EXPECT_EQ(Log(), " TRACE    ADDIN     kpxAddin.OnAssignClasses(QuarnApp)\r\n"
                   " TRACE    ADDIN     kpxAddin.OnAssignClasses(QuarnApp).\r\n"
                   " TRACE    ADDIN     kpxAddin.OnAssignClasses(QuarnApp)\r\n"
                   " TRACE    ADDIN     kpxAddin.OnAssignClasses(QuarnApp).\r\n"
                   " ERROR    ADDIN     kpxAddin.OnAssignClasses(QuarnApp) failed: no component\r\n");

  withSibling = false;
  world.journal.clear();
  EXPECT_EQ(api->OnAssignClasses(a), 0);
  EXPECT_EQ(world.journal, (test::Journal{"app.AddInManager", "vc.Name"}));
}

TEST_F(CommandTest, ForwardingWithoutTheSiblingWritesOneErrorLineEach) {
  Activate();
  withSibling = false;
  ObjectPtr a = app;
  EXPECT_EQ(api->OnGenerateCode(a), 0);
  EXPECT_EQ(api->OnComponentAssignment(a), 0);
  EXPECT_EQ(api->OnModelUpdate(a), 0);
  EXPECT_EQ(Log(), " TRACE    ADDIN     kpxAddin.OnGenerateCode(QuarnApp)\r\n"
                   " ERROR    ADDIN     kpxAddin.OnGenerateCode(QuarnApp) failed to get VisualStudio addin.\r\n"
                   " TRACE    ADDIN     kpxAddin.OnComponentAssignment(QuarnApp)\r\n"
                   " ERROR    ADDIN     kpxAddin.OnComponentAssignment(QuarnApp) failed to get VisualStudio addin.\r\n"
                   " TRACE    ADDIN     kpxAddin.OnModelUpdate(QuarnApp).\r\n"
                   " ERROR    ADDIN     kpxAddin.StartModelUpdate(QuarnApp) failed to get VisualStudio addin.\r\n");
}

TEST_F(CommandTest, GenerateCodeHandsTheApplicationByReferenceAndTakesItBack) {
  auto replacement = std::make_shared<FakeObject>("other-app", nullptr);
  handler->On(1, "OnGenerateCode", [&](Args args) -> Variant {
    EXPECT_TRUE(args[0].isByRef());
    args[0].assign(Variant(ObjectPtr(replacement)));
    return {};
  });
  Activate();
  ObjectPtr a = app;
  api->OnGenerateCode(a);
  EXPECT_EQ(a, replacement);
}

TEST_F(CommandTest, FaqRunsScriptsOrObjectsAndFallsBackToTheFaqHelpFile) {
  Activate();
  ObjectPtr a = app;
  settings["OnFAQ"] = " C:\\Scripts\\faq.EBS ";
  api->OnFAQ(a);
  EXPECT_NE(std::find(world.journal.begin(), world.journal.end(), "app.ExecuteScript C:\\Scripts\\faq.EBS"),
            world.journal.end());
  EXPECT_TRUE(world.ui.help.empty());

  auto noFaq = std::make_shared<FakeObject>("nofaq", nullptr);
  world.factory.makers["Tools.Faq"] = [&] { return noFaq; };
  settings["OnFAQ"] = "Tools.Faq";
  world.journal.clear();
  api->OnFAQ(a);
  EXPECT_TRUE(world.ui.help.empty());  // no faq-vc.hlp beside the help file
  // Nothing to show: the host is not asked for a window to show it in.
  EXPECT_EQ(std::count(world.journal.begin(), world.journal.end(), "app.GetMainWnd"), 0);
  world.files.at("C:\\Quarn\\Help\\faq-vc.hlp") = "";
  api->OnFAQ(a);
  EXPECT_EQ(world.ui.help, (std::vector<std::string>{"C:\\Quarn\\Help\\faq-vc.hlp"}));
  EXPECT_EQ(std::count(world.journal.begin(), world.journal.end(), "app.GetMainWnd"), 1);

  api->OnHowTo(a);
  EXPECT_EQ(world.ui.help.back(), "C:\\Quarn\\Help\\vc.hlp");
}

}  // namespace
}  // namespace kpx

namespace kpx {
namespace {

// Companions may hand back another host application in the argument they
// were given by reference; every caller keeps what comes back.
TEST_F(CommandTest, EveryCallerKeepsTheApplicationACompanionHandsBack) {
  auto other = std::make_shared<FakeObject>("other app", nullptr);
  auto handBack = [other](Args a) -> Variant {
    a[0].assign(Variant(ObjectPtr(other)));
    return true;
  };
  auto pages = std::make_shared<FakeObject>("pages", &world.journal);
  pages->On(1, "ShowProperties", [other](Args a) -> Variant {
    EXPECT_EQ(a.size(), 2u);  // the application, then the page
    EXPECT_EQ(a[1].toInt32(), 3);
    a[0].assign(Variant(ObjectPtr(other)));
    return true;
  });
  world.factory.makers["{05D99488-AB9F-11D2-B9EB-006008BF3ACB}"] = [pages] { return pages; };
  auto faq = std::make_shared<FakeObject>("faq", &world.journal);
  faq->On(1, "OnFAQ", handBack);
  world.factory.makers["Tools.Faq"] = [faq] { return faq; };
  auto five = std::make_shared<FakeObject>("five", &world.journal);
  five->On(1, "OnUser5", handBack);
  world.factory.makers["Tools.Five"] = [five] { return five; };
  settings["OnUser5"] = "C|Five|Tools.Five";
  settings["OnFAQ"] = "Tools.Faq";
  Activate();

  ObjectPtr a = app;
  EXPECT_TRUE(api->OnLangProperties(a, Variant(3)).toBool());
  EXPECT_EQ(a, other);
  a = app;
  api->OnFAQ(a);
  EXPECT_EQ(a, other);
  EXPECT_TRUE(world.ui.help.empty());  // handled: no help file
  // The fifth slot is reached from its menu entry like the others.
  a = app;
  std::string entry = "UClass_OnUser5";
  api->OnSelectedContextMenuItem(a, entry);
  EXPECT_EQ(a, other);
  EXPECT_EQ(five->calls, 1);
  EXPECT_NE(Log().find("  END OnUser5()  OK"), std::string::npos);
}

TEST_F(CommandTest, AFailingClassWizardIsLoggedAsCritical) {
  auto wizard = std::make_shared<FakeObject>("wizard", &world.journal);
  wizard->On(1, "StartClassWizard", [](Args) -> Variant { throw AutomationError(5, "no project"); });
  world.factory.makers["tznclwiz.api"] = [wizard] { return wizard; };
  Activate();
  ObjectPtr a = app;
  EXPECT_EQ(api->OnClassWizard(a), 0);
  EXPECT_EQ(Log(), " TRACE    ADDIN     BEGIN kpxAddin:OnClassWizard\r\n"
                   " CRITICAL ADDIN     ERROR kpxAddin:OnClassWizard: Call to CW failed: no project\r\n");
}

// The importer takes the host application through its holder interface,
// never by a name on its default interface.
TEST_F(CommandTest, TheTypeLibraryImporterIsHandedTheApplicationThroughItsHolderInterface) {
  auto importer = std::make_shared<FakeObject>("importer", &world.journal);
  auto holder = std::make_shared<FakeObject>("holder", &world.journal);
  importer->On(1, "QuarnApp", nullptr);  // a decoy on the default interface
  holder->On(7, "QuarnApp", nullptr);
  importer->Interface("{DDA8932A-8C47-11D3-813D-00A0C938B875}", holder);
  world.factory.makers["{B025E5DB-4064-11D3-B9F7-006008BF3ACB}"] = [importer] { return importer; };
  Activate();
  EXPECT_EQ(api->TypeLibImporter(), importer);
  EXPECT_EQ(world.journal, (test::Journal{"holder.QuarnApp <obj>"}));
  EXPECT_EQ(api->TypeLibImporter(), importer);  // made once
  EXPECT_EQ(holder->calls, 1);

  // An importer without the interface is kept, and the failure logged.
  api = nullptr;
  auto bare = std::make_shared<FakeObject>("bare", &world.journal);
  world.factory.makers["{B025E5DB-4064-11D3-B9F7-006008BF3ACB}"] = [bare] { return bare; };
  Activate();
  EXPECT_EQ(api->TypeLibImporter(), bare);
  EXPECT_EQ(Log(), " TRACE    ADDIN     kpxAddin.TypeLibImporter()\r\n"
                   " ERROR    ADDIN     kpxAddin.Get TypeLibImporter(): Type mismatch\r\n");
}

TEST_F(CommandTest, CodeUpdateEventsClearThePendingErrorAndAnswerZero) {
  Activate();
  ObjectPtr a = app;
  for (const char* member : {"OnCodeUpdateStart", "OnCodeUpdateEnd"}) {
    module.error() = {75, "Path/File access error"};
    Variant byRef(a);
    std::vector<Variant> args{Variant::Ref(&byRef)};
    EXPECT_EQ(api->Invoke(api->IdOfName(member), CallKind::Method, args).toInt32(), 0) << member;
    EXPECT_EQ(module.error().number, 0) << member;
    EXPECT_EQ(module.error().description, "") << member;
  }
  module.error() = {75, "Path/File access error"};
  EXPECT_EQ(api->OnModelUpdateStart(a), 0);
  EXPECT_EQ(api->OnModelUpdateEnd(a), 0);
  EXPECT_EQ(module.error().number, 75);  // the model-update events leave it
}

}  // namespace
}  // namespace kpx
