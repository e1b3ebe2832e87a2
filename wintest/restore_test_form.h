// A Restore form of the test host's own, for the window's tests and its
// pictures: projects and their files, the layout rules of the real dialog
// (each control follows the right and bottom edges by its margin and stops
// at its bound), and a record of every action the window hands it.
#pragma once

#include <string>
#include <vector>

#include "automation/automation_error.h"
#include "platform/platform.h"

namespace wintest {

using kpx::platform::ControlRect;
using kpx::platform::RestoreControl;
using kpx::platform::RestoreRow;

class TestForm final : public kpx::platform::RestoreForm {
 public:
  struct Project {
    std::string name;
    std::vector<std::string> files;  // file names, all in the project's folder
  };
  explicit TestForm(const std::vector<Project>& projects) {
    texts_.caption = "Restore Source";
    texts_.instructions =
        "Check the files to put back from their backups and click OK. "
        "Click a file to compare it with its backup first.";
    texts_.ok = "OK";
    texts_.cancel = "Cancel";
    texts_.help = "Help";
    texts_.columns[0] = "Project";
    texts_.columns[1] = "File";
    texts_.columns[2] = "Folder";
    texts_.columnTwips[0] = 2000;
    texts_.columnTwips[1] = 1500;
    texts_.columnTwips[2] = 8000;
    for (const Project& p : projects) {
      RestoreRow project;
      project.project = true;
      project.key = p.name;
      project.cells[0] = p.name;
      rows_.push_back(project);
      for (const std::string& f : p.files) {
        RestoreRow file;
        file.key = p.name + "|" + f;
        file.cells[1] = f;
        file.cells[2] = "C:\\work\\" + p.name;
        file.modified = "23.11.2026 07:45:00";
        rows_.push_back(file);
      }
    }
    title_ = "Source Backups";
    calls.reserve(4096);
  }

  const Texts& texts() const override { return texts_; }
  const std::vector<RestoreRow>& rows() const override { return rows_; }
  int32_t selectedRow() const override { return selected_; }
  const std::string& headerTitle() const override { return title_; }
  const std::string& headerSubtitle() const override { return subtitle_; }
  bool okEnabled() const override {
    for (const RestoreRow& r : rows_)
      if (r.check == 1 || r.check == 3) return true;
    return false;
  }
  ControlRect DesignRect(RestoreControl control) const override {
    switch (control) {
      case RestoreControl::List: return {120, 120, 8250, 4725};
      case RestoreControl::Ok: return {5865, 5045, 1095, 375};
      case RestoreControl::Cancel: return {7295, 5045, 1095, 375};
      default: return {120, 5045, 1095, 375};
    }
  }
  double designWidth() const override { return 8490; }
  double designHeight() const override { return 5520; }
  double minimumWidth() const override { return minWidth; }
  double minimumHeight() const override { return minHeight; }
  void Resize(double width, double height, ControlRect (&rects)[size_t(RestoreControl::Count)]) override {
    const auto follow = [](double& value, double wanted, double bound) {
      if (wanted >= bound && wanted != value) value = wanted;
    };
    ControlRect& list = rects[size_t(RestoreControl::List)];
    follow(list.height, height - 675 - list.top, 3975);
    follow(list.width, width - 120 - list.left, 8235);
    ControlRect& ok = rects[size_t(RestoreControl::Ok)];
    follow(ok.left, width - 1530 - ok.width, 5760);
    follow(ok.top, height - 100 - ok.height, 5040);
    ControlRect& cancel = rects[size_t(RestoreControl::Cancel)];
    follow(cancel.left, width - 100 - cancel.width, 7080);
    follow(cancel.top, height - 100 - cancel.height, 5040);
    ControlRect& help = rects[size_t(RestoreControl::Help)];
    follow(help.top, height - 100 - help.height, 5040);
    for (size_t i = 0; i < size_t(RestoreControl::Count); ++i) last[i] = rects[i];
    ++resizes;
  }

  void Select(int32_t row) override {
    calls.push_back("select " + std::to_string(row));
    selected_ = row;
    const bool project = rows_[size_t(row)].project;
    title_ = project ? "Backups of the selected project" : "Source Backups";
    subtitle_ = project ? "23.11.2026 07:45:00 - time of the last backup" : "";
  }
  void SetCheck(int32_t row, bool ticked) override {
    calls.push_back(std::string(ticked ? "tick " : "untick ") + std::to_string(row));
    if (rows_[size_t(row)].project) {
      for (size_t i = size_t(row) + 1; i < rows_.size() && !rows_[i].project; ++i) rows_[i].check = ticked ? 1 : 0;
    } else {
      rows_[size_t(row)].check = ticked ? 1 : 0;
    }
    // The project's box says whether all, some or none of its files are ticked.
    int32_t project = row;
    while (!rows_[size_t(project)].project) --project;
    size_t files = 0, on = 0;
    for (size_t i = size_t(project) + 1; i < rows_.size() && !rows_[i].project; ++i, ++files) on += rows_[i].check == 1;
    rows_[size_t(project)].check = on == 0 ? 0 : on == files ? 1 : 3;
  }
  std::string Click(int32_t row, bool& startTimer) override {
    calls.push_back("click " + std::to_string(row));
    startTimer = rows_[size_t(row)].project && timerOnClick;
    return rows_[size_t(row)].project ? std::string() : compareCaption;
  }
  void Compare(int32_t row) override { calls.push_back("compare " + std::to_string(row)); }
  void Timer() override { calls.push_back("timer"); }
  void Help(int64_t window) override {
    calls.push_back("help");
    helpWindow = window;
    if (failHelp) throw kpx::AutomationError(kpx::vberr::kFileNotFound, "no help file");
  }
  void Ok() override { calls.push_back("ok"); }
  void Cancel() override { calls.push_back("cancel"); }

  // Read by the playing thread while the window's thread appends: never
  // moved.
  std::vector<std::string> calls;
  double minWidth = 8610, minHeight = 5895;
  std::string compareCaption = "Compare with WinMerge";
  bool timerOnClick = false, failHelp = false;
  int64_t helpWindow = 0;
  int resizes = 0;
  ControlRect last[size_t(RestoreControl::Count)];

 private:
  Texts texts_;
  std::vector<RestoreRow> rows_;
  int32_t selected_ = -1;
  std::string title_, subtitle_;
};

}  // namespace wintest
