// The readable form of an event log: one aligned line per event and a
// summary at the end, for people following what the add-in did.
#pragma once

#include <cstdint>
#include <cstdio>
#include <map>
#include <ostream>
#include <string>
#include <vector>

#include "sim/event_log.h"

namespace kpx::sim {

// A value of the log written short: $app, "text", 12, True, Empty, Nothing ...
std::string ShortValue(const EventJson& value);

// One line (without its line break) for one event.
std::string TranscriptLine(const EventJson& event);

// Texts kept for the end of a transcript, outside memory where the
// system offers a temporary file: a long run may write millions.
class SpillList {
 public:
  SpillList();
  ~SpillList();
  SpillList(const SpillList&) = delete;
  SpillList& operator=(const SpillList&) = delete;
  void Add(const std::string& text);
  uint64_t size() const { return size_; }
  // Calls `each` with every text, in order.
  template <typename F>
  void ForEach(F each) const;

 private:
  std::FILE* file_ = nullptr;
  uint64_t inFile_ = 0;
  std::vector<std::string> memory_;  // those after the file, when there is none or it failed
  uint64_t size_ = 0;
};

template <typename F>
void SpillList::ForEach(F each) const {
  if (file_ && inFile_ > 0) {
    std::fflush(file_);
    std::rewind(file_);
    uint64_t n = 0;
    std::string s;
    for (uint64_t i = 0; i < inFile_ && std::fread(&n, sizeof n, 1, file_) == 1; ++i) {
      s.assign(n, '\0');
      if (std::fread(s.data(), 1, n, file_) != n) break;
      each(s);
    }
    std::fseek(file_, 0, SEEK_END);
  }
  for (const std::string& s : memory_) each(s);
}

// Writes the transcript as the events come: each event's line at once, the
// summary at the end. `title` heads the text.
class TranscriptWriter final : public EventSink {
 public:
  TranscriptWriter(std::ostream& out, const std::string& title);
  void Write(const EventJson& event) override;
  void Flush() override { out_.flush(); }
  bool broken() const override { return !out_; }
  // Writes the summary of the events so far.
  void Finish();

 private:
  std::ostream& out_;
  std::vector<std::string> members_;  // in the order of their first call
  std::map<std::string, uint64_t> calls_, hostCalls_, errors_;
  SpillList addins_, debugLines_;
  uint64_t regRead_ = 0, regMissing_ = 0, regWritten_ = 0, keysCreated_ = 0, hostLog_ = 0, companionCalls_ = 0,
           deletes_ = 0, appends_ = 0, objects_ = 0, failedObjects_ = 0, debugFailed_ = 0, faults_ = 0;
};

// All lines, then the summary. `title` heads the text.
std::string Transcript(const std::vector<EventJson>& events, const std::string& title);

}  // namespace kpx::sim
