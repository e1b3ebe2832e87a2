// Putting source files back from the backups code generation leaves. The
// backups are recorded in two layers: numbered settings of the "VC++"
// add-in ("1", "2", ... up to the first empty one), each a record
// "folder path|project|list file", and per project a list file with one
// line "source path|backup path" per backed-up file. A restore moves the
// backup over the source, gives it the current time, and brings the list
// files and records up to date; nothing that was not restored is dropped.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "automation/object.h"
#include "restore/kpx_restore_form.h"
#include "shared/module.h"

namespace kpx {

// The list file of a project: the folder of `first`, the backup folder,
// and `second` + ".lst"; "" unless both are given.
std::string BackupListPath(Module& module, std::string_view first, std::string_view second);

// How many of the rows have the check value `value`.
int32_t CountNodesWithValue(const std::vector<platform::RestoreRow>& rows, const std::vector<int32_t>& which,
                            int32_t value);

class RestoreSource {
 public:
  explicit RestoreSource(Module& module) : module_(module) {}

  // The Restore Source command: the records, the dialog, the restore.
  void RestoreSourceFiles(const ObjectPtr& QuarnApp);

  // Adds a record's project and its backups that still exist to the dialog.
  void LoadBackupRecord(KpxRestoreForm& form, const std::string& record);
  // Restores what is ticked in the dialog, after one confirmation, and
  // rewrites or deletes the list files; drops the records of projects
  // restored in full.
  void ApplyRestore(KpxRestoreForm& form, std::vector<std::string>& records, const ObjectPtr& QuarnApp);
  // Moves the backup of a restore item over its source. Every outcome but
  // "nothing to do" is written to the host's log.
  bool RestoreFile(const std::string& item, const ObjectPtr& QuarnApp);
  // Gives a file the current time as its last-access and last-write times,
  // keeping its creation time and its attributes.
  bool TouchFile(const std::string& path);

 private:
  void HostLog(const ObjectPtr& QuarnApp, const std::string& line);
  Module& module_;
  platform::FileError touchError_;  // why the last TouchFile failed
};

}  // namespace kpx
