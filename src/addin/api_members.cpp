#include "addin/api_members.h"

#include "addin/api.h"
#include "automation/automation_error.h"

namespace kpx {

namespace {

using Args = std::span<Variant>;
using T = ApiType;

constexpr ApiParam App{"QuarnApp", T::Object, true, false};
constexpr ApiParam None{};

// An object argument, written back to the caller when it came by reference
// (a callee may replace the host application it was given).
class ObjectArg {
 public:
  explicit ObjectArg(Variant& v) : v_(v), object_(v.toObject()) {}
  ~ObjectArg() {
    if (v_.isByRef()) v_.assign(Variant(object_));
  }
  ObjectArg(const ObjectArg&) = delete;
  ObjectArg& operator=(const ObjectArg&) = delete;
  operator ObjectPtr&() { return object_; }

 private:
  Variant& v_;
  ObjectPtr object_;
};

// Members whose behaviour is not there yet have no `call`: they answer
// "not implemented".
constexpr ApiMember M(const char* name, T result, std::array<ApiParam, 4> params, uint8_t count,
                      Variant (*call)(API&, Args) = nullptr) {
  return ApiMember{name, CallKind::Method, result, params, count, call};
}
constexpr ApiMember G(const char* name, T result, Variant (*call)(API&, Args) = nullptr) {
  return ApiMember{name, CallKind::PropertyGet, result, {None, None, None, None}, 0, call};
}
// A command taking the host application alone.
constexpr ApiMember Cmd(const char* name, Variant (*call)(API&, Args) = nullptr) {
  return M(name, T::Int32, {App, None, None, None}, 1, call);
}

constexpr ApiParam Str(const char* n) { return {n, T::String, true, false}; }
constexpr ApiParam Obj(const char* n) { return {n, T::Object, true, false}; }

const std::array<ApiMember, kApiMemberCount> kMembers = {{
    M("OnSelectedContextMenuItem", T::Bool, {App, Str("internalName"), None, None}, 2),
    M("OnEnableContextMenuItems", T::None, {App, ApiParam{"itemType", T::Int16, true, false}, None, None}, 2),
    M("ValidateComponent", T::Variant,
      {Obj("item"), ApiParam{"count", T::Int16, true, false}, ApiParam{"hasVC", T::Bool, true, false},
       ApiParam{"failed", T::Bool, true, false}},
      4),
    G("ModelAssistantAPI", T::Object),
    Cmd("OnModelAssistant"),
    Cmd("OnModelConverter"),
    Cmd("OnClassWizard"),
    Cmd("OnImportMFC"),
    M("OnLangProperties", T::Variant, {App, ApiParam{"lPage", T::Int32, true, true}, None, None}, 2),
    Cmd("OnDefaultLangProperties",
        [](API& a, Args x) -> Variant { return a.OnDefaultLangProperties(ObjectArg(x[0])); }),
    G("LangPropertiesAPI", T::Object, [](API& a, Args) -> Variant { return a.LangPropertiesAPI(); }),
    G("CompPropertiesAPI", T::Object, [](API& a, Args) -> Variant { return a.CompPropertiesAPI(); }),
    G("TypeLibImporter", T::Object, [](API& a, Args) -> Variant { return a.TypeLibImporter(); }),
    M("CanDropFileOnDiagram", T::Int32, {App, Str("FileName"), None, None}, 2,
      [](API& a, Args) -> Variant { return a.CanDropFileOnDiagram(); }),
    M("CanDropFileOnItem", T::Int32, {App, Obj("Item"), Str("FileName"), None}, 3,
      [](API& a, Args) -> Variant { return a.CanDropFileOnItem(); }),
    M("DropFileOnDiagram", T::Int32, {App, Str("FileName"), None, None}, 2,
      [](API& a, Args) -> Variant { return a.DropFileOnDiagram(); }),
    M("DropFileOnItem", T::Int32, {App, Obj("Item"), Str("FileName"), None}, 3,
      [](API& a, Args) -> Variant { return a.DropFileOnItem(); }),
    G("Name", T::String, [](API& a, Args) -> Variant { return a.Name(); }),
    G("QuarnApp", T::Object, [](API& a, Args) -> Variant { return a.QuarnApp(); }),
    Cmd("OnActivate", [](API& a, Args x) -> Variant { return a.OnActivate(ObjectArg(x[0])); }),
    Cmd("OnDeactivate", [](API& a, Args x) -> Variant { return a.OnDeactivate(ObjectArg(x[0])); }),
    Cmd("OnAppInit", [](API& a, Args x) -> Variant { return a.OnAppInit(ObjectArg(x[0])); }),
    Cmd("OnBrowseComponent"),
    Cmd("OnBrowseBody"),
    Cmd("OnBrowseHeader"),
    Cmd("OnGenerateCode"),
    Cmd("OnModelUpdate"),
    Cmd("OnModelUpdateSelection"),
    Cmd("OnComponentAssignment"),
    Cmd("OnNewModel"),
    G("CodeIcons", T::Object),
    G("LargeCodeIcons", T::Object),
    G("LanguageId", T::Int32),
    G("LanguageName", T::String),
    G("LanguageInfo", T::String),
    G("ComponentInfo", T::String),
    G("StatementGenerator", T::Object),
    G("CodeViewProject", T::Object),
    G("ComponentStereotypes", T::Variant),
    G("ClassStereotypes", T::Variant),
    M("OnProperties", T::Bool,
      {ApiParam{"anItem", T::Variant, true, false}, ApiParam{"aContext", T::Variant, true, true}, None, None}, 2),
    M("OnNewComponent", T::Int32, {App, Obj("Component"), None, None}, 2),
    Cmd("OnRestoreSource"),
    M("IsLanguageOperational", T::Bool, {App, None, None, None}, 1),
    M("GetLocation", T::String, {Str("Path"), ApiParam{"UseDefault", T::Bool, true, false}, None, None}, 2),
    Cmd("OnUser1"),
    Cmd("OnUser2"),
    Cmd("OnUser3"),
    Cmd("OnUser4"),
    Cmd("OnUser5"),
    Cmd("OnHowTo"),
    Cmd("OnFAQ"),
    Cmd("OnExpand2ATLObject"),
    Cmd("OnNewATLObject"),
    Cmd("OnAddMethod"),
    Cmd("OnAddProperty"),
    Cmd("OnImplementInterfaces"),
    Cmd("OnModuleDependencyProperties"),
    Cmd("OnExposeProperty"),
    Cmd("OnCodeUpdateStart"),
    Cmd("OnCodeUpdateEnd"),
    Cmd("OnModelUpdateStart"),
    Cmd("OnModelUpdateEnd"),
    Cmd("OnAssignClasses"),
    Cmd("OnImportATL"),
    M("RenderClass", T::Int32, {App, Obj("aClass"), None, None}, 2),
    M("OnNewModelElement", T::None, {Obj("armiQuarnApp"), Obj("armiQuarnItem"), None, None}, 2),
    M("OnModifiedModelElement", T::None,
      {Obj("armiQuarnApp"), Obj("armiQuarnItem"), ApiParam{"aintReason", T::Int32, true, false}, None}, 3),
    M("OnDeletedModelElement", T::None, {Obj("armiQuarnApp"), Obj("armiQuarnItem"), None, None}, 2),
}};

}  // namespace

std::span<const ApiMember> ApiMembers() { return kMembers; }

}  // namespace kpx
