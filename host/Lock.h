// criticalSection: a re-entrant lock whose copies control the same lock, so
// that an object can hand out its lock by value.
//
// Contract: every enter is matched by one leave on the same thread. lock,
// unlock and try_lock make it usable with std::scoped_lock.
#pragma once

#include "host/HostExport.h"

class HOST_API criticalSection {
 public:
  criticalSection();
  criticalSection(const criticalSection& other) noexcept;
  criticalSection& operator=(const criticalSection& other) noexcept;
  ~criticalSection();

  void enter() const noexcept;
  void leave() const noexcept;
  bool tryEnter() const noexcept;

  void lock() const noexcept { enter(); }
  void unlock() const noexcept { leave(); }
  bool try_lock() const noexcept { return tryEnter(); }

  // True when both control the same lock.
  bool sharesLockWith(const criticalSection& other) const noexcept { return shared_ == other.shared_; }

 private:
  struct Shared;
  Shared* shared_;
};

// Holds a criticalSection for a scope.
class CriticalSectionLock {
 public:
  explicit CriticalSectionLock(const criticalSection& cs) noexcept : cs_(cs) { cs_.enter(); }
  ~CriticalSectionLock() { cs_.leave(); }
  CriticalSectionLock(const CriticalSectionLock&) = delete;
  CriticalSectionLock& operator=(const CriticalSectionLock&) = delete;

 private:
  const criticalSection& cs_;
};
