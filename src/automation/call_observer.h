// Told when a call into an object begins and when it ends. A host that
// measures its own share of the add-in's members sets one: the simulated
// host's objects report every call into them, and a COM bridge reports
// every call into an object it serves. A call made inside another call is
// reported too, nested within it.
#pragma once

namespace kpx {

class CallObserver {
 public:
  virtual void Enter() = 0;
  virtual void Leave() = 0;

 protected:
  ~CallObserver() = default;
};

// The span of one call, for the observer when there is one.
class ObservedCall {
 public:
  explicit ObservedCall(CallObserver* observer) : observer_(observer) {
    if (observer_) observer_->Enter();
  }
  ~ObservedCall() {
    if (observer_) observer_->Leave();
  }
  ObservedCall(const ObservedCall&) = delete;
  ObservedCall& operator=(const ObservedCall&) = delete;

 private:
  CallObserver* observer_;
};

}  // namespace kpx
