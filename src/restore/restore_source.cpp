#include "restore/restore_source.h"

#include "addin/find_addin.h"
#include "automation/error_styles.h"
#include "automation/vb_strings.h"
#include "restore/file_utilities.h"
#include "shared/host_ids.h"
#include "shared/shared_debug_logger.h"

namespace kpx {

namespace {

constexpr int kMbYesNo = 4;
constexpr int kMbInformation = 64;
constexpr int kIdYes = 6;

// A restore item without its two project fields: the list-file line.
std::string ListLineOf(std::string_view item) {
  const size_t first = item.find('|');
  const size_t second = first == std::string_view::npos ? first : item.find('|', first + 1);
  return second == std::string_view::npos ? std::string() : std::string(item.substr(second + 1));
}

}  // namespace

std::vector<std::string> ListFileLines(const std::string& text) {
  std::vector<std::string> lines;
  std::string line;
  for (size_t i = 0; i < text.size(); ++i) {
    const char c = text[i];
    if (c == '\r' || c == '\n') {
      lines.push_back(std::move(line));
      line.clear();
      if (c == '\r' && i + 1 < text.size() && text[i + 1] == '\n') ++i;
    } else {
      line += c;
    }
  }
  if (!line.empty()) lines.push_back(std::move(line));
  return lines;
}

std::string BackupListPath(Module& module, std::string_view first, std::string_view second) {
  if (first.empty() || second.empty()) return {};
  return DirectoryOf(first) + module.resources().MessageString(5029) + "\\" + std::string(second) + ".lst";
}

int32_t CountNodesWithValue(const std::vector<platform::RestoreRow>& rows, const std::vector<int32_t>& which,
                            int32_t value) {
  int32_t count = 0;
  for (int32_t i : which)
    if (rows[i].check == value) ++count;
  return count;
}

void RestoreSource::HostLog(const ObjectPtr& QuarnApp, const std::string& line) {
  CallMethod(QuarnApp, hostid::kWriteErrorLog, {Variant(line)});
}

void RestoreSource::RestoreSourceFiles(const ObjectPtr& QuarnApp) {
  module_.DebugLog("RestoreSourceMod.RestoreSourceFiles(QuarnApp)", logid::ADDIN, loglevel::TRACE);
  ResourceStrings& res = module_.resources();
  ObjectPtr addIn = FindAddIn(QuarnApp, "VC++");
  const std::string& section = res.MessageString(5028);

  std::vector<std::string> records;
  for (int i = 1;; ++i) {
    std::string record =
        CallMethod(addIn, hostid::kReadSetting, {Variant(section), Variant(std::to_string(i)), Variant("")})
            .toString();
    if (record.empty()) break;
    records.push_back(std::move(record));
  }
  const size_t oldCount = records.size();
  if (records.empty()) {
    module_.platform().ui.MessageBox(res.MessageString(5010), res.MessageString(5011), platform::kMbOk);
    return;
  }

  KpxRestoreForm form(module_);
  form.setQuarnApp(QuarnApp);
  form.setVCAddin(addIn);
  form.InitDifferenceTool(QuarnApp, addIn);
  for (const std::string& record : records) LoadBackupRecord(form, record);
  form.SelectItem(records.front());
  form.ShowRestoreDialog(QuarnApp);
  ApplyRestore(form, records, QuarnApp);

  // The records again without gaps; the entries freed at the end are
  // emptied so that the list still ends at the first empty one.
  for (size_t i = 1; i <= oldCount; ++i)
    CallMethod(addIn, hostid::kWriteSetting,
               {Variant(section), Variant(std::to_string(i)), Variant(i <= records.size() ? records[i - 1] : "")});
}

void RestoreSource::LoadBackupRecord(KpxRestoreForm& form, const std::string& record) {
  module_.DebugLog("RestoreSourceMod.LoadBackupRecord(" + record + ")", logid::ADDIN, loglevel::TRACE);
  platform::FileSystem& files = module_.platform().files;
  CatchAll(
      [&] {
        const std::string listPath = FieldOf(record, 3);
        if (listPath.empty() || !FileExists(files, listPath)) return;
        std::vector<std::string> kept;
        for (const std::string& raw : ListFileLines(files.ReadText(listPath))) {
          const std::string line = Trim(raw);
          if (line.empty()) continue;
          if (FileExists(files, FieldOf(line, 2))) kept.push_back(line);
        }
        if (!kept.empty()) form.AddEntry(record, kept);
      },
      [&](const AutomationError& e) {
        module_.DebugLog("RestoreSourceMod.LoadBackupRecord: " + e.description(), logid::ADDIN, loglevel::ERROR);
      });
}

void RestoreSource::ApplyRestore(KpxRestoreForm& form, std::vector<std::string>& records, const ObjectPtr& QuarnApp) {
  module_.DebugLog("RestoreSourceMod.ApplyRestore(QuarnApp)", logid::ADDIN, loglevel::TRACE);
  ResourceStrings& res = module_.resources();
  platform::UserInterface& ui = module_.platform().ui;
  platform::FileSystem& files = module_.platform().files;
  const std::vector<platform::RestoreRow>& rows = form.rows();
  if (rows.empty()) return;

  bool confirmed = false;
  int32_t restored = 0;
  std::vector<bool> dropped(records.size(), false);
  for (size_t i = 0; i < records.size(); ++i) {
    const KpxRestoreForm::Project project = form.FindProject(records[i]);
    if (project.row < 0) continue;
    if (CountNodesWithValue(rows, project.files, 1) == 0) continue;
    if (!confirmed) {
      if (ui.MessageBox(res.MessageString(5016), res.MessageString(5011), kMbYesNo) != kIdYes) {
        ui.MessageBox(res.MessageString(5017), res.MessageString(5011), kMbInformation);
        return;
      }
      confirmed = true;
    }

    int32_t restoredHere = 0;
    std::string keptLines;
    for (int32_t row : project.files) {
      if (rows[row].check == 1 && RestoreFile(rows[row].key, QuarnApp)) {
        ++restoredHere;
        continue;
      }
      // Kept whole, backup path and all, so that the next restore lists it.
      keptLines += ListLineOf(rows[row].key) + "\r\n";
    }
    restored += restoredHere;
    if (restoredHere == 0) continue;

    const std::string listPath = BackupListPath(module_, FieldOf(records[i], 1), FieldOf(records[i], 2));
    if (keptLines.empty()) {
      if (files.RemoveFile(listPath)) {
        dropped[i] = true;
      } else {
        HostLog(QuarnApp, res.MessageString(5012) + listPath + ": " + files.LastError().description);
      }
    } else if (!files.ReplaceText(listPath, keptLines)) {
      // The old list stays whole; its restored lines name backups that are
      // gone, and loading skips those.
      HostLog(QuarnApp, res.MessageString(5012) + listPath + ": " + files.LastError().description);
    }
  }

  std::vector<std::string> left;
  for (size_t i = 0; i < records.size(); ++i)
    if (!dropped[i]) left.push_back(std::move(records[i]));
  records = std::move(left);

  if (restored > 0) ui.MessageBox(res.LoadResString(5032), res.MessageString(5011), kMbInformation);
}

bool RestoreSource::RestoreFile(const std::string& item, const ObjectPtr& QuarnApp) {
  module_.DebugLog("RestoreSourceMod.RestoreFile(" + item + ")", logid::ADDIN, loglevel::TRACE);
  ResourceStrings& res = module_.resources();
  platform::FileSystem& files = module_.platform().files;
  const std::string source = FieldOf(item, 3);
  const std::string backup = FieldOf(item, 4);
  if (backup.empty()) return true;

  bool result = true;
  std::string message;
  auto failed = [&](const std::string& reason) {
    message = res.MessageString(5013) + source + ": " + reason;
    result = false;
  };
  if (!FileExists(files, backup)) {
    message = backup + res.MessageString(5014);
    result = false;
  } else if (const std::optional<uint32_t> attributes = files.GetAttributes(source)) {
    // Asked once: the attributes say whether the source exists as well.
    if (*attributes & platform::kAttributeReadOnly) {
      // Never forced: the user may have made it read-only on purpose.
      message = ResourceStrings::ReplacePlaceholder(
          "%2", source, ResourceStrings::ReplacePlaceholder("%1", res.MessageString(5013), res.LoadResString(5033)));
      result = false;
    } else if (!files.RemoveFile(source)) {
      failed(files.LastError().description);
    }
  }
  if (result && !TouchFile(backup)) failed(touchError_.description);
  if (result) {
    if (files.MoveFile(backup, source)) message = source + res.MessageString(5015);
    else failed(files.LastError().description);
  }
  if (!message.empty()) CatchAll([&] { HostLog(QuarnApp, message); }, [](const AutomationError&) {});
  return result;
}

bool RestoreSource::TouchFile(const std::string& path) {
  module_.DebugLog("RestoreSourceMod.TouchFile(" + path + ")", logid::ADDIN, loglevel::TRACE);
  platform::FileSystem& files = module_.platform().files;
  const std::optional<uint32_t> attributes = files.GetAttributes(path);
  if (!attributes) {
    touchError_ = files.LastError();
    return false;
  }
  files.SetAttributes(path, *attributes & ~platform::kAttributeReadOnly);

  bool result = false;
  touchError_ = {};
  // The first failure is the reason given; putting the attributes back
  // must not replace it.
  auto fail = [&] {
    if (touchError_.number == 0) touchError_ = files.LastError();
  };
  const platform::FileHandle file = files.OpenForTimes(path);
  if (file != platform::kNoFile) {
    platform::FileTimes times;
    if (files.GetFileTimes(file, times)) {
      if (const std::optional<platform::FileTime> now = module_.platform().clock.SystemFileTime()) {
        times.lastAccess = *now;
        times.lastWrite = *now;
        result = files.SetFileTimes(file, times);
        if (!result) fail();
      } else {
        touchError_ = {vberr::kInvalidCall, VbErrorDescription(vberr::kInvalidCall)};
      }
    } else {
      fail();
    }
    files.CloseFile(file);
  } else {
    fail();
  }
  files.SetAttributes(path, *attributes);
  return result;
}

}  // namespace kpx
