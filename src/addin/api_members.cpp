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
    M("OnSelectedContextMenuItem", T::Bool, {App, Str("internalName"), None, None}, 2,
      [](API& a, Args x) -> Variant {
        std::string name = x[1].toString();
        bool r = a.OnSelectedContextMenuItem(ObjectArg(x[0]), name);
        if (x[1].isByRef()) x[1].assign(Variant(name));
        return r;
      }),
    M("OnEnableContextMenuItems", T::None, {App, ApiParam{"itemType", T::Int16, true, false}, None, None}, 2,
      [](API& a, Args x) -> Variant {
        int16_t itemType = x[1].toInt16();
        a.OnEnableContextMenuItems(ObjectArg(x[0]), itemType);
        return {};
      }),
    M("ValidateComponent", T::Variant,
      {Obj("item"), ApiParam{"count", T::Int16, true, false}, ApiParam{"hasVC", T::Bool, true, false},
       ApiParam{"failed", T::Bool, true, false}},
      4,
      [](API& a, Args x) -> Variant {
        // The out-values start from what the caller passed, as by-reference
        // arguments do, and go back only where the member set them.
        int16_t count = x[1].isEmpty() ? int16_t{0} : x[1].toInt16();
        bool hasVC = x[2].isEmpty() ? false : x[2].toBool();
        bool failed = x[3].isEmpty() ? false : x[3].toBool();
        Variant r = a.ValidateComponent(x[0].toObject(), count, hasVC, failed);
        x[1].assign(Variant(count));
        x[2].assign(Variant(hasVC));
        x[3].assign(Variant(failed));
        return r;
      }),
    G("ModelAssistantAPI", T::Object, [](API& a, Args) -> Variant { return a.ModelAssistantAPI(); }),
    Cmd("OnModelAssistant", [](API& a, Args x) -> Variant { return a.OnModelAssistant(ObjectArg(x[0])); }),
    Cmd("OnModelConverter", [](API& a, Args x) -> Variant { return a.OnModelConverter(ObjectArg(x[0])); }),
    Cmd("OnClassWizard", [](API& a, Args x) -> Variant { return a.OnClassWizard(ObjectArg(x[0])); }),
    Cmd("OnImportMFC", [](API& a, Args x) -> Variant { return a.OnImportMFC(ObjectArg(x[0])); }),
    M("OnLangProperties", T::Variant, {App, ApiParam{"lPage", T::Int32, true, true}, None, None}, 2,
      [](API& a, Args x) -> Variant { return a.OnLangProperties(ObjectArg(x[0]), x[1]); }),
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
    Cmd("OnBrowseComponent", [](API& a, Args x) -> Variant { return a.OnBrowseComponent(ObjectArg(x[0])); }),
    Cmd("OnBrowseBody", [](API& a, Args x) -> Variant { return a.OnBrowseBody(ObjectArg(x[0])); }),
    Cmd("OnBrowseHeader", [](API& a, Args x) -> Variant { return a.OnBrowseHeader(ObjectArg(x[0])); }),
    Cmd("OnGenerateCode", [](API& a, Args x) -> Variant { return a.OnGenerateCode(ObjectArg(x[0])); }),
    Cmd("OnModelUpdate", [](API& a, Args x) -> Variant { return a.OnModelUpdate(ObjectArg(x[0])); }),
    Cmd("OnModelUpdateSelection", [](API& a, Args x) -> Variant { return a.OnModelUpdateSelection(ObjectArg(x[0])); }),
    Cmd("OnComponentAssignment", [](API& a, Args x) -> Variant { return a.OnComponentAssignment(ObjectArg(x[0])); }),
    Cmd("OnNewModel", [](API& a, Args x) -> Variant { return a.OnNewModel(ObjectArg(x[0])); }),
    G("CodeIcons", T::Object, [](API& a, Args) -> Variant { return a.CodeIcons(); }),
    G("LargeCodeIcons", T::Object, [](API& a, Args) -> Variant { return a.LargeCodeIcons(); }),
    G("LanguageId", T::Int32, [](API& a, Args) -> Variant { return a.LanguageId(); }),
    G("LanguageName", T::String, [](API& a, Args) -> Variant { return a.LanguageName(); }),
    G("LanguageInfo", T::String, [](API& a, Args) -> Variant { return a.LanguageInfo(); }),
    G("ComponentInfo", T::String, [](API& a, Args) -> Variant { return a.ComponentInfo(); }),
    G("StatementGenerator", T::Object, [](API& a, Args) -> Variant { return a.StatementGenerator(); }),
    G("CodeViewProject", T::Object, [](API& a, Args) -> Variant { return a.CodeViewProject(); }),
    G("ComponentStereotypes", T::Variant, [](API& a, Args) -> Variant { return a.ComponentStereotypes(); }),
    G("ClassStereotypes", T::Variant, [](API& a, Args) -> Variant { return a.ClassStereotypes(); }),
    M("OnProperties", T::Bool,
      {ApiParam{"anItem", T::Variant, true, false}, ApiParam{"aContext", T::Variant, true, true}, None, None}, 2,
      [](API& a, Args x) -> Variant { return a.OnProperties(x[0].deref(), x[1].deref()); }),
    M("OnNewComponent", T::Int32, {App, Obj("Component"), None, None}, 2,
      [](API& a, Args x) -> Variant { return a.OnNewComponent(ObjectArg(x[0]), ObjectArg(x[1])); }),
    Cmd("OnRestoreSource", [](API& a, Args x) -> Variant { return a.OnRestoreSource(ObjectArg(x[0])); }),
    M("IsLanguageOperational", T::Bool, {App, None, None, None}, 1,
      [](API& a, Args) -> Variant { return a.IsLanguageOperational(); }),
    M("GetLocation", T::String, {Str("Path"), ApiParam{"UseDefault", T::Bool, true, false}, None, None}, 2,
      [](API& a, Args x) -> Variant { return a.GetLocation(x[0].toString(), x[1].toBool()); }),
    Cmd("OnUser1", [](API& a, Args x) -> Variant { return a.OnUser(1, ObjectArg(x[0])); }),
    Cmd("OnUser2", [](API& a, Args x) -> Variant { return a.OnUser(2, ObjectArg(x[0])); }),
    Cmd("OnUser3", [](API& a, Args x) -> Variant { return a.OnUser(3, ObjectArg(x[0])); }),
    Cmd("OnUser4", [](API& a, Args x) -> Variant { return a.OnUser(4, ObjectArg(x[0])); }),
    Cmd("OnUser5", [](API& a, Args x) -> Variant { return a.OnUser(5, ObjectArg(x[0])); }),
    M("OnHowTo", T::None, {App, None, None, None}, 1,
      [](API& a, Args x) -> Variant { a.OnHowTo(ObjectArg(x[0])); return {}; }),
    M("OnFAQ", T::None, {App, None, None, None}, 1,
      [](API& a, Args x) -> Variant { a.OnFAQ(ObjectArg(x[0])); return {}; }),
    Cmd("OnExpand2ATLObject", [](API& a, Args x) -> Variant { return a.OnExpand2ATLObject(ObjectArg(x[0])); }),
    Cmd("OnNewATLObject", [](API& a, Args x) -> Variant { return a.OnNewATLObject(ObjectArg(x[0])); }),
    Cmd("OnAddMethod", [](API& a, Args x) -> Variant { return a.OnAddMethod(ObjectArg(x[0])); }),
    Cmd("OnAddProperty", [](API& a, Args x) -> Variant { return a.OnAddProperty(ObjectArg(x[0])); }),
    Cmd("OnImplementInterfaces", [](API& a, Args x) -> Variant { return a.OnImplementInterfaces(ObjectArg(x[0])); }),
    Cmd("OnModuleDependencyProperties",
        [](API& a, Args x) -> Variant { return a.OnModuleDependencyProperties(ObjectArg(x[0])); }),
    Cmd("OnExposeProperty", [](API& a, Args x) -> Variant { return a.OnExposeProperty(ObjectArg(x[0])); }),
    Cmd("OnCodeUpdateStart", [](API& a, Args x) -> Variant { return a.OnCodeUpdateStart(ObjectArg(x[0])); }),
    Cmd("OnCodeUpdateEnd", [](API& a, Args x) -> Variant { return a.OnCodeUpdateEnd(ObjectArg(x[0])); }),
    Cmd("OnModelUpdateStart", [](API& a, Args x) -> Variant { return a.OnModelUpdateStart(ObjectArg(x[0])); }),
    Cmd("OnModelUpdateEnd", [](API& a, Args x) -> Variant { return a.OnModelUpdateEnd(ObjectArg(x[0])); }),
    Cmd("OnAssignClasses", [](API& a, Args x) -> Variant { return a.OnAssignClasses(ObjectArg(x[0])); }),
    Cmd("OnImportATL", [](API& a, Args x) -> Variant { return a.OnImportATL(ObjectArg(x[0])); }),
    M("RenderClass", T::Int32, {App, Obj("aClass"), None, None}, 2,
      [](API& a, Args x) -> Variant { return a.RenderClass(ObjectArg(x[0]), ObjectArg(x[1])); }),
    M("OnNewModelElement", T::None, {Obj("armiQuarnApp"), Obj("armiQuarnItem"), None, None}, 2,
      [](API& a, Args x) -> Variant {
        a.OnNewModelElement(x[0].toObject(), x[1].toObject());
        return {};
      }),
    M("OnModifiedModelElement", T::None,
      {Obj("armiQuarnApp"), Obj("armiQuarnItem"), ApiParam{"aintReason", T::Int32, true, false}, None}, 3,
      [](API& a, Args x) -> Variant {
        a.OnModifiedModelElement(x[0].toObject(), x[1].toObject(), x[2].toInt32());
        return {};
      }),
    M("OnDeletedModelElement", T::None, {Obj("armiQuarnApp"), Obj("armiQuarnItem"), None, None}, 2,
      [](API& a, Args x) -> Variant {
        a.OnDeletedModelElement(x[0].toObject(), x[1].toObject());
        return {};
      }),
}};

}  // namespace

std::span<const ApiMember> ApiMembers() { return kMembers; }

std::string EntryTraceLine(std::string_view member) {
  std::string line = "kpxAddin.";
  line += member;
  line += '(';
  for (const ApiMember& m : kMembers) {
    if (member != m.name) continue;
    for (uint8_t i = 0; i < m.paramCount; ++i) {
      if (i) line += ", ";
      line += m.params[i].name;
    }
    break;
  }
  line += ')';
  return line;
}

}  // namespace kpx
