// The Restore Source dialog's state and rules: a list of projects, each
// with the backed-up files of its list file below it, ticks, a two-line
// header that follows the selected row, OK only while something is ticked,
// and the comparison of a file with its backup. The window only shows this
// and hands the user's actions back (platform::RestoreForm).
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "automation/object.h"
#include "platform/platform.h"
#include "restore/difference_tool.h"
#include "shared/module.h"

namespace kpx {

class KpxRestoreForm final : public platform::RestoreForm {
 public:
  // Loads the captions, as the form does when it loads.
  explicit KpxRestoreForm(Module& module);

  // Empties the list, sets the header back and creates the columns.
  void Reset();
  // One project row for the backup record and a file row per list-file line
  // (source path "|" backup path), in order.
  void AddEntry(std::string_view record, const std::vector<std::string>& lines);
  // Selects the row with that key (a project's record or a file's restore
  // item), as when the dialog opens.
  void SelectItem(std::string_view key);
  void SelectProject(std::string_view record);
  // Shows the dialog until OK or Cancel; with no rows only says that there
  // are no backups.
  void ShowRestoreDialog(const ObjectPtr& QuarnApp);
  bool InitDifferenceTool(const ObjectPtr& QuarnApp, const ObjectPtr& VCAddin);

  void setQuarnApp(ObjectPtr app) { QuarnApp_ = std::move(app); }
  const ObjectPtr& QuarnApp() const { return QuarnApp_; }
  void setVCAddin(ObjectPtr addIn) { VCAddin_ = std::move(addIn); }
  const ObjectPtr& VCAddin() const { return VCAddin_; }
  DifferenceTool& differenceTool() { return difference_; }

  // The rows of one project: its row's index and the indexes of its file
  // rows; nothing found gives project -1.
  struct Project {
    int32_t row = -1;
    std::vector<int32_t> files;
  };
  Project FindProject(std::string_view record) const;

  // platform::RestoreForm
  const Texts& texts() const override { return texts_; }
  const std::vector<platform::RestoreRow>& rows() const override { return rows_; }
  int32_t selectedRow() const override { return selected_; }
  const std::string& headerTitle() const override { return headerTitle_; }
  const std::string& headerSubtitle() const override { return headerSubtitle_; }
  bool okEnabled() const override;
  platform::ControlRect DesignRect(platform::RestoreControl control) const override;
  double designWidth() const override { return kDesignWidth; }
  double designHeight() const override { return kDesignHeight; }
  double minimumWidth() const override;
  double minimumHeight() const override;
  void Resize(double width, double height,
              platform::ControlRect (&rects)[size_t(platform::RestoreControl::Count)]) override;
  void Select(int32_t row) override;
  void SetCheck(int32_t row, bool ticked) override;
  std::string Click(int32_t row, bool& startTimer) override;
  void Compare(int32_t row) override;
  void Timer() override;
  void Help(int64_t window) override;
  void Ok() override {}
  void Cancel() override;

  // The design: the client area and the controls' places, twips. The
  // header's two lines and the instructions sit above the list and do not
  // move.
  static constexpr double kDesignWidth = 8490, kDesignHeight = 5670;
  static constexpr std::string_view kFormTag = "W(0,8610)H(0,5895)";
  static constexpr platform::ControlRect kHeaderTitleRect{120, 60, 8250, 255};
  static constexpr platform::ControlRect kHeaderSubtitleRect{120, 315, 8250, 255};
  static constexpr platform::ControlRect kInstructionsRect{120, 600, 8250, 390};
  static constexpr int32_t kHelpTopic = 145;

 private:
  void ShowProjectHeader(int32_t row, int32_t titleId);
  void RecountProject(int32_t projectRow);

  Module& module_;
  Texts texts_;
  std::vector<platform::RestoreRow> rows_;
  int32_t selected_ = -1;
  std::string headerTitle_, headerSubtitle_;
  ObjectPtr QuarnApp_, VCAddin_;
  DifferenceTool difference_;
};

}  // namespace kpx
