#include "restore/kpx_restore_form.h"

#include "automation/error_styles.h"
#include "automation/vb_strings.h"
#include "restore/min_window_size.h"
#include "shared/host_ids.h"
#include "shared/shared_debug_logger.h"

namespace kpx {

namespace {

using platform::RestoreControl;

constexpr int32_t kChecked = 1;
constexpr int32_t kPartly = 3;  // a project row with only some of its files ticked

// Each control's tag: which edges it follows and where it stops.
constexpr std::string_view kControlTags[] = {
    "H(675,3975)W(120,8235)",  // the list
    "R(1530,5760)B(100,5040)",  // OK
    "R(100,7080)B(100,5040)",  // Cancel
    "B(100,5040)",  // Help
};
constexpr platform::ControlRect kDesignRects[] = {
    {120, 1020, 8250, 3975},  // the list
    {5760, 5195, 1215, 375},  // OK
    {7175, 5195, 1215, 375},  // Cancel
    {120, 5195, 1215, 375},   // Help
};

std::string FileNameOf(std::string_view path) {
  const size_t slash = path.rfind('\\');
  return std::string(slash == std::string_view::npos ? path : path.substr(slash + 1));
}

std::string FolderOf(std::string_view path) {
  const size_t slash = path.rfind('\\');
  return slash == std::string_view::npos ? std::string() : std::string(path.substr(0, slash));
}

}  // namespace

KpxRestoreForm::KpxRestoreForm(Module& module) : module_(module), difference_(module) {
  ResourceStrings& res = module_.resources();
  texts_.caption = res.MessageString(5011);
  texts_.instructions = res.MessageString(5027);
  texts_.ok = res.MessageString(30013);
  texts_.cancel = res.MessageString(30003);
  texts_.help = res.MessageString(30000);
  Reset();
}

void KpxRestoreForm::Reset() {
  rows_.clear();
  selected_ = -1;
  headerTitle_ = module_.resources().MessageString(5018);
  headerSubtitle_.clear();
  const int32_t columnIds[] = {5021, 5023, 5024};
  const double widths[] = {2000, 1500, 8000};
  for (int i = 0; i < 3; ++i) {
    texts_.columns[i] = module_.resources().MessageString(columnIds[i]);
    texts_.columnTwips[i] = widths[i];
  }
}

void KpxRestoreForm::AddEntry(std::string_view record, const std::vector<std::string>& lines) {
  platform::RestoreRow project;
  project.project = true;
  project.key = std::string(record);
  project.cells[0] = FieldOf(record, 2);
  rows_.push_back(std::move(project));
  const std::string prefix = FieldOf(record, 1) + "|" + FieldOf(record, 2) + "|";
  for (const std::string& line : lines) {
    platform::RestoreRow file;
    file.key = prefix + line;
    const std::string source = FieldOf(line, 1);
    file.cells[1] = FileNameOf(source);
    file.cells[2] = FolderOf(source);
    // The backup's date as it is now: the list shows when each copy was made.
    if (auto date = module_.platform().files.FileDateTime(FieldOf(line, 2))) file.modified = FormatShortDateTime(*date);
    rows_.push_back(std::move(file));
  }
}

KpxRestoreForm::Project KpxRestoreForm::FindProject(std::string_view record) const {
  Project found;
  for (int32_t i = 0; i < static_cast<int32_t>(rows_.size()); ++i) {
    if (found.row < 0) {
      if (rows_[i].project && rows_[i].key == record) found.row = i;
    } else if (rows_[i].project) {
      break;
    } else {
      found.files.push_back(i);
    }
  }
  return found;
}

void KpxRestoreForm::SelectItem(std::string_view key) {
  for (int32_t i = 0; i < static_cast<int32_t>(rows_.size()); ++i)
    if (rows_[i].key == key) {
      selected_ = i;
      // The row chosen for the user when the dialog opens.
      if (rows_[i].project) ShowProjectHeader(i, 5036);
      return;
    }
}

void KpxRestoreForm::SelectProject(std::string_view record) {
  const std::string prefix = std::string(record) + "|";
  for (int32_t i = 0; i < static_cast<int32_t>(rows_.size()); ++i)
    if (rows_[i].project && (rows_[i].key == record || rows_[i].key.starts_with(prefix))) {
      SelectItem(rows_[i].key);
      return;
    }
}

void KpxRestoreForm::ShowProjectHeader(int32_t row, int32_t titleId) {
  headerTitle_ = module_.resources().LoadResString(titleId);
  headerSubtitle_.clear();
  // The list file's date: when code generation last backed up this project.
  if (auto date = module_.platform().files.FileDateTime(FieldOf(rows_[row].key, 3)))
    headerSubtitle_ = FormatShortDateTime(*date);
  headerSubtitle_ += module_.resources().MessageString(5020);
}

void KpxRestoreForm::Select(int32_t row) {
  CatchAll(
      [&] {
        if (row < 0 || row >= static_cast<int32_t>(rows_.size())) return;
        selected_ = row;
        if (rows_[row].project) {
          ShowProjectHeader(row, 5034);
        } else {
          headerTitle_ = module_.resources().MessageString(5018);
          headerSubtitle_.clear();
        }
      },
      [](const AutomationError&) {});
}

void KpxRestoreForm::RecountProject(int32_t projectRow) {
  size_t files = 0, ticked = 0;
  for (int32_t i = projectRow + 1; i < static_cast<int32_t>(rows_.size()) && !rows_[i].project; ++i) {
    ++files;
    if (rows_[i].check == kChecked) ++ticked;
  }
  rows_[projectRow].check = ticked == 0 ? 0 : ticked == files ? kChecked : kPartly;
}

void KpxRestoreForm::SetCheck(int32_t row, bool ticked) {
  if (row < 0 || row >= static_cast<int32_t>(rows_.size())) return;
  if (rows_[row].project) {
    for (int32_t i = row + 1; i < static_cast<int32_t>(rows_.size()) && !rows_[i].project; ++i)
      rows_[i].check = ticked ? kChecked : 0;
    RecountProject(row);
    // A project without files still shows the user's tick.
    if (ticked && rows_[row].check == 0) rows_[row].check = kChecked;
    return;
  }
  rows_[row].check = ticked ? kChecked : 0;
  int32_t project = row;
  while (project >= 0 && !rows_[project].project) --project;
  if (project >= 0) RecountProject(project);
}

bool KpxRestoreForm::okEnabled() const {
  for (const platform::RestoreRow& row : rows_)
    if (row.check == kChecked || row.check == kPartly) return true;
  return false;
}

std::string KpxRestoreForm::Click(int32_t row, bool& startTimer) {
  startTimer = false;
  if (row < 0 || row >= static_cast<int32_t>(rows_.size())) return {};
  if (rows_[row].project) {
    startTimer = difference_.ProjectClicked();
    return {};
  }
  return difference_.toolName();
}

void KpxRestoreForm::Compare(int32_t row) {
  if (row < 0 || row >= static_cast<int32_t>(rows_.size()) || rows_[row].project) return;
  difference_.RunDifference(rows_[row].key);
}

void KpxRestoreForm::Timer() { difference_.TimerFired(); }

void KpxRestoreForm::Help(int64_t window) {
  CatchAll(
      [&] {
        const std::string helpFile = GetProperty(VCAddin_, hostid::kHelpFile).toString();
        if (!helpFile.empty()) module_.platform().ui.WinHelp(window, helpFile, platform::kHelpContext, kHelpTopic);
      },
      [](const AutomationError&) {});
}

void KpxRestoreForm::Cancel() {
  // Nothing ticked is left for the restore to find: Cancel changes nothing.
  rows_.clear();
  selected_ = -1;
}

platform::ControlRect KpxRestoreForm::DesignRect(RestoreControl control) const {
  return kDesignRects[static_cast<size_t>(control)];
}

double KpxRestoreForm::minimumWidth() const { return MinimumSizeOf(kFormTag).width; }
double KpxRestoreForm::minimumHeight() const { return MinimumSizeOf(kFormTag).height; }

void KpxRestoreForm::Resize(double width, double height,
                            platform::ControlRect (&rects)[size_t(RestoreControl::Count)]) {
  for (size_t i = 0; i < size_t(RestoreControl::Count); ++i) {
    LayoutControl control{kControlTags[i], rects[i].left, rects[i].top, rects[i].width, rects[i].height};
    ApplyLayoutTag(module_, control, width, height);
    rects[i] = {control.left, control.top, control.width, control.height};
  }
}

bool KpxRestoreForm::InitDifferenceTool(const ObjectPtr& QuarnApp, const ObjectPtr& VCAddin) {
  QuarnApp_ = QuarnApp;
  VCAddin_ = VCAddin;
  return difference_.InitDifferenceTool(QuarnApp, VCAddin);
}

void KpxRestoreForm::ShowRestoreDialog(const ObjectPtr& QuarnApp) {
  ResourceStrings& res = module_.resources();
  if (rows_.empty()) {
    module_.platform().ui.MessageBox(res.MessageString(5010), res.MessageString(5011), platform::kMbOk);
    return;
  }
  platform::HostPlacement where;
  ResumeNext onError;
  onError([&] {
    where.ownerWindow = static_cast<int64_t>(CallByName(QuarnApp, hostid::kGetMainWnd, CallKind::Method).toDouble());
  });
  onError([&] { where.top = GetProperty(QuarnApp, hostid::kWindowTop).toInt32(); });
  onError([&] { where.left = GetProperty(QuarnApp, hostid::kWindowLeft).toInt32(); });
  onError([&] { where.height = GetProperty(QuarnApp, hostid::kWindowHeight).toInt32(); });
  onError([&] { where.width = GetProperty(QuarnApp, hostid::kWindowWidth).toInt32(); });
  module_.platform().ui.ShowRestoreDialog(*this, where);
}

}  // namespace kpx
