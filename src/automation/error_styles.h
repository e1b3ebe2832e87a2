// The three ways a routine of the add-in treats failures. Each routine uses
// one of them, visible at its first line:
//  - no trap: failures simply propagate to the caller (and to the host);
//  - ResumeNext: every statement runs through it; a failure is remembered
//    and the routine carries on with the next statement;
//  - CatchAll: the body runs; the first failure ends it and goes to one
//    handler at the end.
#pragma once

#include <cstdint>
#include <exception>
#include <string>
#include <utility>

#include "automation/automation_error.h"

namespace kpx {

// The failure being handled, as an automation error (other C++ exceptions
// become error 51 with their text). Call only inside a catch block.
AutomationError CurrentError();

class ResumeNext {
 public:
  // Runs one statement. Returns true when it did not fail; a failure is kept
  // as the pending error (like VB's Err) until Clear() or the next failure.
  template <class F>
  bool operator()(F&& statement) {
    try {
      std::forward<F>(statement)();
      return true;
    } catch (...) {
      AutomationError e = CurrentError();
      number_ = e.number();
      description_ = e.description();
      return false;
    }
  }

  void Clear() { number_ = 0; description_.clear(); }
  bool failed() const { return number_ != 0; }
  int32_t number() const { return number_; }
  const std::string& description() const { return description_; }

 private:
  int32_t number_ = 0;
  std::string description_;
};

// Runs `body`; when it fails, runs `handler(error)` and returns what that returns.
template <class Body, class Handler>
auto CatchAll(Body&& body, Handler&& handler) -> decltype(body()) {
  try {
    return std::forward<Body>(body)();
  } catch (...) {
    return std::forward<Handler>(handler)(CurrentError());
  }
}

}  // namespace kpx
