// What the host asks of the language about components and classes: the
// stereotypes it offers, the text describing its components, and the
// events of a new component and of drawing a class.
#include "addin/api.h"
#include "model/stereotype_config.h"

namespace kpx {

Variant API::ComponentStereotypes() {
  TraceEntry("ComponentStereotypes");
  return Variant(StereotypeList(module_.platform(), QuarnApp(), "VC++", kComponentSection));
}

Variant API::ClassStereotypes() {
  TraceEntry("ClassStereotypes");
  return Variant(StereotypeList(module_.platform(), QuarnApp(), "VC++", kClassSection));
}

// Shown by the host where it describes a component of this language.
std::string API::ComponentInfo() {
  TraceEntry("ComponentInfo");
  return "Microsoft Visual C++ 6.0 project";
}

// A new component needs nothing from the add-in: its project and workspace
// settings are made by the "VisualStudio" add-in when code is first
// generated for it, in the folder the user picks then, and the host gives a
// new component of this language the tool's default properties itself.
// Anything written here would be a guess the sibling overwrites.
int32_t API::OnNewComponent(ObjectPtr&, ObjectPtr&) {
  TraceEntry("OnNewComponent");
  return 0;
}

// 0: the host draws the class in its own notation. The language has no
// figure of its own for classes; its stereotypes show as the host shows
// any stereotype.
int32_t API::RenderClass(ObjectPtr&, ObjectPtr&) {
  TraceEntry("RenderClass");
  return 0;
}

}  // namespace kpx
