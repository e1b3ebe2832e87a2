#include "sim/transcript.h"

#include <cstdio>
#include <map>
#include <sstream>

namespace kpx::sim {

namespace {

// A field of an event, null when the event lacks it: the transcript must read
// any log, including events of kinds it does not know.
const EventJson& F(const EventJson& e, const char* key) {
  static const EventJson kNull;
  auto it = e.find(key);
  return it == e.end() ? kNull : *it;
}

std::string Str(const EventJson& e, const char* key) {
  auto it = e.find(key);
  if (it == e.end() || it->is_null()) return {};
  return it->is_string() ? it->get<std::string>() : it->dump();
}

// Quotes text for people: Windows paths keep their single backslashes.
uint64_t Count(const EventJson& v) {
  return v.is_number_integer() && v.get<int64_t>() >= 0 ? v.get<uint64_t>() : 0;
}

std::string Quoted(const std::string& s) {
  std::string out = "\"";
  for (char c : s) {
    if (c == '"')
      out += "\\\"";
    else if (c == '\r')
      out += "\\r";
    else if (c == '\n')
      out += "\\n";
    else
      out += c;
  }
  return out + "\"";
}

std::string ErrorText(const EventJson& error) {
  if (!error.is_object()) return "?";
  const int64_t number = error.value("number", int64_t{0});
  char num[32];
  if (number < 0)
    std::snprintf(num, sizeof num, "0x%08X", static_cast<unsigned>(static_cast<uint32_t>(number)));
  else
    std::snprintf(num, sizeof num, "%lld", static_cast<long long>(number));
  return std::string(num) + " " + Str(error, "description");
}

std::string Args(const EventJson& args) {
  std::string out;
  for (const EventJson& a : args) out += (out.empty() ? "" : ", ") + ShortValue(a);
  return out;
}

std::string RegistryPlace(const EventJson& e) {
  const std::string name = Str(e, "name");
  return Str(e, "root") + "\\" + Str(e, "key") + "  " + (name.empty() ? "@" : name);
}

std::string RegistryValueText(const EventJson& value) {
  if (value.is_string()) return Quoted(value.get<std::string>());
  return value.dump();
}

std::string Line(const char* tag, const std::string& text) {
  char head[16];
  std::snprintf(head, sizeof head, "  %-9s ", tag);
  return head + text;
}

std::string Plural(uint64_t n, const char* one, const char* many) {
  return std::to_string(n) + " " + (n == 1 ? one : many);
}

}  // namespace

std::string ShortValue(const EventJson& v) {
  if (v.is_null()) return "Empty";
  if (v.is_boolean()) return v.get<bool>() ? "True" : "False";
  if (v.is_string()) return Quoted(v.get<std::string>());
  if (v.is_number()) return v.dump();
  if (v.is_object() && v.size() == 1) {
    const std::string& form = v.begin().key();
    const EventJson& inner = v.begin().value();
    if (form == "object") return inner.is_null() ? "Nothing" : inner.get<std::string>();
    if (form == "null") return "Null";
    if (form == "byref") return "byref " + ShortValue(inner);
    if (form == "collection" && inner.is_array()) {
      std::string items;
      for (const EventJson& item : inner) items += (items.empty() ? "" : ", ") + ShortValue(item);
      return "collection [" + items + "]";
    }
  }
  // A collection of code icons: "codeicons(2) Class 16x16, Interface 16x16".
  if (v.is_object() && v.value("object", EventJson()) == "codeicons" && v.contains("items")) {
    std::string text = "codeicons(" + F(v, "count").dump() + ")";
    const char* separator = " ";
    for (const EventJson& item : F(v, "items")) {
      const EventJson& key = F(item, "key");
      text += separator + (key.is_string() ? key.get<std::string>() : std::string("?")) + " " +
              F(item, "width").dump() + "x" + F(item, "height").dump();
      separator = ", ";
    }
    if (v.contains("missing")) text += "; missing " + F(v, "missing").dump();
    return text;
  }
  return v.dump();
}

std::string TranscriptLine(const EventJson& e) {
  const std::string ev = Str(e, "ev");
  const std::string hostCalls =
      e.contains("hostCalls") ? "   [" + Plural(Count(F(e, "hostCalls")), "host call", "host calls") + "]" : "";
  if (ev == "create")
    return Line("create", e.value("ok", false) ? "add-in object created" : "FAILED " + ErrorText(F(e, "error")));
  if (ev == "release") {
    std::string text = e.value("implicit", false) ? "add-in object released at the end" : "add-in object released";
    if (e.contains("skipped")) text = "nothing to release";
    return Line("release", text);
  }
  if (ev == "object-create") {
    const std::string how = e.contains("progid") ? "CreateObject(" + Str(e, "progid") + ")" : "New " + Str(e, "clsid");
    return Line("object",
                e.value("ok", false) ? Str(e, "instance") + " = " + how : how + " FAILED " + ErrorText(F(e, "error")));
  }
  if (ev == "call") return Line("call", Str(e, "member") + "(" + Args(F(e, "args")) + ")");
  if (ev == "result") {
    std::string text = Str(e, "member") + " = " + ShortValue(F(e, "value"));
    if (e.contains("byref"))
      for (const auto& [pos, value] : F(e, "byref").items()) text += ", arg " + pos + " = " + ShortValue(value);
    return Line("result", text + hostCalls);
  }
  if (ev == "error") return Line("error", Str(e, "member") + " raised " + ErrorText(e) + hostCalls);
  if (ev == "skip") return Line("skip", Str(e, "member") + " (" + Str(e, "reason") + ")");
  const std::string injected = e.value("fault", false) ? "   [injected]" : "";
  if (ev == "registry-read") {
    const std::string value =
        F(e, "value").is_null() ? "(missing)" : RegistryValueText(F(e, "value")) + " (" + Str(e, "type") + ")";
    return Line("reg read", RegistryPlace(e) + " = " + value + injected);
  }
  if (ev == "registry-write")
    return Line("reg write", RegistryPlace(e) + " := " + RegistryValueText(F(e, "value")) + " (" + Str(e, "type") +
                                 ")" + (e.value("written", false) ? "" : " NOT WRITTEN"));
  if (ev == "registry-create")
    return Line("reg key", Str(e, "root") + "\\" + Str(e, "key") + " " + Str(e, "disposition") + injected);
  if (ev == "fault") {
    const std::string call = e.contains("call") ? " (call " + Str(e, "call") + ")" : "";
    return Line("fault", Str(e, "object") + "." + Str(e, "member") + "(" + Args(F(e, "args")) + ")" + call +
                             " raised " + ErrorText(F(e, "error")));
  }
  if (ev == "file-exists")
    return Line("file", "exists " + Str(e, "path") + "? " + (e.value("exists", false) ? "yes" : "no"));
  if (ev == "file-delete")
    return Line("file", "delete " + Str(e, "path") + (e.value("ok", false) ? "" : " (nothing deleted)"));
  if (ev == "file-append")
    return Line("file",
                "append " + Str(e, "path") + " " + Quoted(Str(e, "text")) + (e.value("ok", false) ? "" : " FAILED"));
  if (ev == "diagram-add") return Line("diagram", Str(e, "diagram") + " shows " + Str(e, "class"));
  if (ev == "file-read")
    return Line("file", "read " + Str(e, "path") + (e.value("ok", false) ? "" : " FAILED " + ErrorText(F(e, "error"))));
  if (ev == "debuglog") return Line("log", Str(e, "line") + (e.value("ok", false) ? "" : "   [not written]"));
  if (ev == "sleep") return Line("sleep", Str(e, "ms") + " ms");
  if (ev == "doevents") return Line("doevents", "");
  if (ev == "messagebox")
    return Line("msgbox", Quoted(Str(e, "text")) + " title " + Quoted(Str(e, "title")) + " style " + Str(e, "style") +
                              " -> " + Str(e, "answer") + " (" + Str(e, "answered") + ")");
  if (ev == "help")
    return Line("help", Str(e, "file") + " command " + Str(e, "command") + " data " + Str(e, "data") + " window " +
                            Str(e, "window"));
  if (ev == "hostlog") return Line("hostlog", Quoted(Str(e, "text")));
  if (ev == "addin") return Line("addin", Str(e, "addin") + "." + Str(e, "action"));
  if (ev == "menu-add")
    return Line("menu", Str(e, "addin") + " add [" + Str(e, "itemType") + "] " + Quoted(Str(e, "caption")) +
                            (Str(e, "name").empty() ? "" : " " + Str(e, "name")));
  if (ev == "menu-state")
    return Line("menu", Str(e, "addin") + " [" + Str(e, "itemType") + "] " + Str(e, "name") +
                            ".MenuState := " + ShortValue(F(e, "value")));
  if (ev == "setting-read")
    return Line("setting", Str(e, "addin") + " [" + Str(e, "section") + "] " + Str(e, "entry") + " -> " +
                               Quoted(Str(e, "value")) + (e.value("found", false) ? "" : " (default)"));
  if (ev == "setting-write")
    return Line("setting",
                Str(e, "addin") + " [" + Str(e, "section") + "] " + Str(e, "entry") + " := " + Quoted(Str(e, "value")));
  if (ev == "companion-call") {
    std::string text = Str(e, "instance") + ".";
    if (e.contains("member"))
      text += Str(e, "member");
    else
      text += "operation " + Str(e, "operation");
    if (e.contains("args")) text += "(" + Args(F(e, "args")) + ")";
    if (e.contains("error")) return Line("companion", text + " raised " + ErrorText(F(e, "error")));
    text += " = " + ShortValue(F(e, "result"));
    if (e.contains("byref"))
      for (const auto& [pos, value] : F(e, "byref").items()) text += ", arg " + pos + " = " + ShortValue(value);
    return Line("companion", text);
  }
  if (ev == "script")
    return Line("script", Str(e, "path") + (e.contains("error") ? " FAILED " + ErrorText(F(e, "error")) : ""));
  if (ev == "element-write") {
    std::string text = Str(e, "element") + "." + Str(e, "member");
    if (e.contains("tool")) text += "(" + Str(e, "tool") + ", " + Str(e, "property") + ")";
    return Line("model", text + " := " + ShortValue(F(e, "value")));
  }
  if (ev == "world") {
    for (const auto& [key, value] : e.items())
      if (key != "ev") return Line("world", key + " " + value.dump());
  }
  if (ev == "world-failed")
    return Line("world", Str(e, "action") + " of line " + Str(e, "line") + " FAILED: " + Str(e, "reason"));
  if (ev == "aborted") return Line("ABORTED", "the run stopped here: " + Str(e, "reason"));
  if (ev == "unused-answers") return Line("world", "answers never used: " + F(e, "buttons").dump());
  return Line(ev.c_str(), e.dump());
}

SpillList::SpillList() : file_(std::tmpfile()) {}

SpillList::~SpillList() {
  if (file_) std::fclose(file_);
}

void SpillList::Add(const std::string& text) {
  ++size_;
  if (file_ && memory_.empty()) {
    const uint64_t length = text.size();
    if (std::fwrite(&length, sizeof length, 1, file_) == 1 &&
        std::fwrite(text.data(), 1, text.size(), file_) == text.size()) {
      ++inFile_;
      return;
    }
  }
  // No temporary file, or it failed (a full disk): the rest stays in memory.
  memory_.push_back(text);
}

TranscriptWriter::TranscriptWriter(std::ostream& out, const std::string& title) : out_(out) {
  out_ << title << "\n\n";
}

void TranscriptWriter::Write(const EventJson& e) {
  out_ << TranscriptLine(e) << '\n';
  const std::string ev = Str(e, "ev"), member = Str(e, "member");
  if (ev == "fault" || e.value("fault", false)) ++faults_;
  if (ev == "call") {
    if (!calls_.count(member)) members_.push_back(member);
    ++calls_[member];
  } else if (ev == "result" || ev == "error") {
    hostCalls_[member] += Count(F(e, "hostCalls"));
    if (ev == "error") ++errors_[member];
  } else if (ev == "addin") {
    addins_.Add(Str(e, "addin") + "." + Str(e, "action"));
  } else if (ev == "registry-read") {
    ++regRead_;
    if (F(e, "value").is_null()) ++regMissing_;
  } else if (ev == "registry-write") {
    if (e.value("written", false)) ++regWritten_;
  } else if (ev == "registry-create") {
    ++keysCreated_;
  } else if (ev == "hostlog") {
    ++hostLog_;
  } else if (ev == "companion-call") {
    ++companionCalls_;
  } else if (ev == "file-delete") {
    if (e.value("ok", false)) ++deletes_;
  } else if (ev == "file-append") {
    ++appends_;
  } else if (ev == "object-create") {
    ++(e.value("ok", false) ? objects_ : failedObjects_);
  } else if (ev == "debuglog") {
    if (e.value("ok", false))
      debugLines_.Add(Str(e, "line"));
    else
      ++debugFailed_;
  }
}

void TranscriptWriter::Finish() {
  auto row = [&](const char* label, const std::string& text) {
    char head[32];
    std::snprintf(head, sizeof head, "  %-16s ", label);
    out_ << head << text << '\n';
  };
  auto perMember = [&](const std::map<std::string, uint64_t>& counts) {
    std::string text;
    for (const std::string& m : members_)
      if (counts.count(m)) text += (text.empty() ? "" : ", ") + m + " " + std::to_string(counts.at(m));
    return text.empty() ? std::string("none") : text;
  };
  out_ << "\nsummary\n";
  row("members called", perMember(calls_));
  row("host calls", perMember(hostCalls_));
  row("raised to host", perMember(errors_));
  if (addins_.size() == 0) {
    row("add-ins", "untouched");
  } else {
    char head[32];
    std::snprintf(head, sizeof head, "  %-16s ", "add-ins");
    out_ << head;
    bool first = true;
    addins_.ForEach([&](const std::string& a) {
      out_ << (first ? "" : ", ") << a;
      first = false;
    });
    out_ << '\n';
  }
  row("registry", Plural(regRead_, "value read", "values read") + " (" + std::to_string(regMissing_) + " missing), " +
                      Plural(regWritten_, "value written", "values written") + ", " +
                      Plural(keysCreated_, "key created or opened", "keys created or opened"));
  row("objects", Plural(objects_, "created", "created") + ", " + std::to_string(failedObjects_) + " failed, " +
                     Plural(companionCalls_, "companion call", "companion calls"));
  row("files", Plural(deletes_, "deleted", "deleted") + ", " + Plural(appends_, "other append", "other appends"));
  row("host log", Plural(hostLog_, "line", "lines"));
  if (faults_) row("faults", Plural(faults_, "injected failure met", "injected failures met"));
  row("debug log", Plural(debugLines_.size(), "line written", "lines written") +
                       (debugFailed_ ? ", " + Plural(debugFailed_, "write failed", "writes failed") : ""));
  debugLines_.ForEach([&](const std::string& line) { out_ << "    " << line << '\n'; });
  out_.flush();
}

std::string Transcript(const std::vector<EventJson>& events, const std::string& title) {
  std::ostringstream out;
  TranscriptWriter writer(out, title);
  for (const EventJson& e : events) writer.Write(e);
  writer.Finish();
  return out.str();
}

}  // namespace kpx::sim
