#include "shared/resource_texts.h"

#include <algorithm>
#include <array>

namespace kpx {
namespace {

// Ordered by id; FindResourceText searches it by halves.
constexpr std::array<ResourceText, 80> kTexts = {{
    // model events, coclass changed: host log line for each rewritten
    // CComCoClass base, the 1176 part (old base name) followed by this one
    // (old name, new name)
    {1132, "%1 is renamed to %2."},
    {1176, "Updating the base class %1 of an ATL object class: "},

    // activation, Developer Studio registration: the IDE add-in key cannot be
    // written or does not read back as written
    {1218,
     "The Visual C++ IDE add-in could not be registered with Developer Studio: its registry key "
     "cannot be written. Round-trip engineering is not available, and the VC++ add-in is switched off."},
    // activation, Developer Studio registration: kpxideaddin.dll is missing
    {1219,
     "The Visual C++ IDE add-in (kpxideaddin.dll) was not found in the installation folder. "
     "Round-trip engineering is not available, and the VC++ add-in is switched off."},

    // context menus: class, component, attribute and operation entries
    {5001, "Model Assistant"},      // class menu: model assistant
    {5002, "Update Code"},          // class and component menus: generate code
    {5003, "Browse Header"},        // class, attribute and operation menus
    {5004, "Browse Source"},        // class, attribute and operation menus: the body
    {5005, "Browse Component"},     // component menu
    {5006, "Assign to Component"},  // class menu: component assignment
    {5007, "Assign Classes"},       // component menu: component assignment
    {5008, "Update Model"},         // class and component menus: model from code
    {5009, "Component Options"},    // component menu

    // restore source: message box when no backups are recorded
    {5010, "There are no source backups to restore."},
    // restore source: title of the dialog and of every restore message box
    {5011, "Restore Source"},
    // restore source, host log: prefix before the path of a list file that
    // cannot be deleted (followed by ": " and the system's reason)
    {5012, "Cannot delete the backup list file "},
    // restore source, host log: prefix before the path of a file that cannot
    // be restored (followed by ": " and the reason); also %1 of 5033
    {5013, "Cannot restore the file "},
    // restore source, host log: follows the path of a missing backup file
    {5014, " does not exist; the source file was not restored."},
    // restore source, host log: follows the path of a restored file
    {5015, " was restored from its backup."},
    // restore source: Yes/No question before the checked files are replaced
    {5016, "The checked source files will be replaced by their backups. Do you want to continue?"},
    // restore source: the user did not confirm
    {5017, "No files were restored."},
    // restore dialog: header title when no project is selected
    {5018, "Source Backups"},
    // restore dialog: loaded with the dialog's texts, not shown at present
    {5019, "Projects with source backups"},
    // restore dialog: follows the list file's date in the header subtitle
    {5020, " - time of the last backup"},
    // restore dialog: column headers (project, modified, file, folder)
    {5021, "Project"},
    {5022, "Modified"},
    {5023, "File"},
    {5024, "Folder"},
    // restore dialog: spare column headers, not used at present
    {5025, "Backup File"},
    {5026, "Backup Date"},
    // restore dialog: instructions above the list
    {5027,
     "Check the files to put back from their backups and click OK. "
     "Right-click a file to compare it with its backup first."},
    // restore source: name of the settings section holding the backup records
    {5028, "Backups"},
    // restore source: backup sub-folder, placed between the project's folder
    // (which keeps its trailing backslash) and "\" + project + ".lst"
    {5029, "Backup"},
    // activation, host log: the VisualStudio add-in was off and is switched on
    {5030,
     "The VisualStudio add-in is not active. The VC++ add-in needs it for round-trip engineering "
     "and activates it now."},
    // activation, host log: Visual C++ 6 is not installed
    {5031,
     "Microsoft Visual C++ 6 is not installed on this computer. Round-trip engineering is not "
     "available, and the VC++ add-in is switched off."},
    // restore source: at least one file was restored
    {5032, "The checked files were restored from their backups."},
    // restore source, host log: read-only source file; %1 the 5013 prefix,
    // %2 the source path
    {5033, "%1%2: the file is read-only and was not overwritten."},
    // restore dialog: header titles for a selected project node
    {5034, "Backups of this project"},
    {5035, "Backups of the selected project"},
    {5036, "Backups of the project"},
    // restore dialog: spare hint, not used at present
    {5037, "Select a project to see its backed-up files."},

    // context menus: ATL submenu and attribute entries
    {5038, "Expand to ATL Object"},  // class menu, ATL submenu
    {5039, "Implement Interface"},   // class menu, ATL submenu
    {5040, "ATL"},                   // class menu: opens the ATL submenu
    {5041, "Add Method"},            // class menu, ATL submenu
    {5042, "Add Property"},          // class menu, ATL submenu
    {5043, "How To"},                // class menu, ATL submenu: help topic
    {5044, "Expose Property"},       // attribute menu

    // prompt dialog: caption of the form before a title is set
    {5045, "Visual C++ Add-In"},
    // new element, inherit relation: an older base-interface relation is
    // deleted; %1 the deleted relation's text
    {5046,
     "An interface can have only one base interface. The older inherit relation %1 is deleted, "
     "and the newest one is kept."},
    // new element, inherit relation: title of 5046
    {5047, "Base Interface Replaced"},
    // new element, realize relation: drawn from an interface to a coclass
    {5048,
     "This realize relation goes from an interface to a coclass. Draw realize relations from the "
     "coclass to the interface it implements. The relation is left as drawn."},
    // new element, realize relation: title of 5048 and 5050
    {5049, "Realize Relation"},
    // new element, realize relation: a coclass realizes a non-interface class
    {5050,
     "A coclass can only realize classes stereotyped \"interface\". The relation is left as drawn, "
     "and nothing is implemented for it."},

    // context menus: expand submenu of the class menu
    {5051, "Expand"},                 // opens the expand submenu
    {5052, "Clients"},                // expand clients
    {5053, "Suppliers"},              // expand suppliers
    {5054, "Clients and Suppliers"},  // expand both

    // model assistant: spare message and title for a command run with no
    // class selected
    {5055, "Please select a class before starting the model assistant."},
    {5056, "Model Assistant"},
    // model events: spare notice and title for updated ATL object classes
    {5057, "The ATL object classes of the coclass were updated."},
    {5058, "ATL Object Classes"},
    // modified coclass: prompt before its ATL object classes' CComCoClass
    // bases are rewritten, and its title
    {5059,
     "The coclass has changed. The CComCoClass base of each of its ATL object classes will be "
     "updated to name the coclass's CLSID. Click Cancel to leave them unchanged."},
    {5060, "Coclass Modified"},

    // class-diagram expansion, host log: the host cannot add classes to a
    // diagram; no class diagram is open
    {5080,
     "The class diagram cannot be expanded: this version of the modelling host does not let add-ins add "
     "classes to a diagram."},
    {5081, "No class diagram is open: open the diagram to expand it with the related classes."},

    // dialog buttons shared by the restore and prompt dialogs
    {30000, "Help"},
    {30001, "Close"},
    {30002, "Yes"},
    {30003, "Cancel"},
    {30004, "No"},
    {30005, "Apply"},
    {30006, "Retry"},
    {30007, "Ignore"},
    {30008, "Browse"},
    {30009, "Select All"},
    {30010, "Clear All"},
    {30011, "Compare"},
    {30012, "Do not show this message again"},  // prompt dialog: check box
    {30013, "OK"},
}};

constexpr bool StrictlyAscending() {
  for (size_t i = 1; i < kTexts.size(); ++i)
    if (kTexts[i - 1].id >= kTexts[i].id) return false;
  return true;
}
static_assert(StrictlyAscending(), "resource texts must be ordered by id, each id once");

}  // namespace

std::span<const ResourceText> ResourceTexts() { return kTexts; }

const char* FindResourceText(int32_t id) {
  auto it = std::lower_bound(kTexts.begin(), kTexts.end(), id,
                             [](const ResourceText& entry, int32_t wanted) { return entry.id < wanted; });
  return it != kTexts.end() && it->id == id ? it->text : nullptr;
}

}  // namespace kpx
