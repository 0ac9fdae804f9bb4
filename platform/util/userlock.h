// Named, ranked locks.
//
// Every lock has a name (possibly empty) and a rank; a thread must take locks
// in increasing rank order. When ZYRD_LOCK_RANK_CHECK is defined (debug and
// test builds), each thread's held locks are tracked and taking a lock whose
// rank is not above every rank the thread already holds panics, so an order
// mistake shows up in tests instead of as a deadlock in production. Rank 0
// means "unranked" and is never checked.
//
// The locks are neither recursive nor copyable. All operations are
// thread-safe.
#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <shared_mutex>
#include <string>

namespace UserLock {

inline constexpr uint32_t kRankUnranked = 0;

// Rank bookkeeping, exposed for the lock classes and for tests.
namespace Rank {
void NoteAcquire(const void* lock, const std::string& name, uint32_t rank);
void NoteRelease(const void* lock);
// Number of ranked locks the calling thread holds.
size_t HeldCount();
}  // namespace Rank

class RWLock {
 public:
  // Never returns null in this implementation; the wrappers below treat null
  // as a fatal start-up error anyway.
  static std::unique_ptr<RWLock> Create(std::string name, uint32_t rank);

  RWLock(const RWLock&) = delete;
  RWLock& operator=(const RWLock&) = delete;

  void AcquireRead();
  void ReleaseRead();
  void AcquireWrite();
  void ReleaseWrite();

  const std::string& Name() const { return name_; }
  uint32_t RankValue() const { return rank_; }

 private:
  RWLock(std::string name, uint32_t rank) : name_(std::move(name)), rank_(rank) {}
  std::shared_mutex mutex_;
  std::string name_;
  uint32_t rank_;
};

class ExclLock {
 public:
  static std::unique_ptr<ExclLock> Create(std::string name, uint32_t rank);

  ExclLock(const ExclLock&) = delete;
  ExclLock& operator=(const ExclLock&) = delete;

  void Acquire();
  void Release();

  const std::string& Name() const { return name_; }
  uint32_t RankValue() const { return rank_; }

 private:
  ExclLock(std::string name, uint32_t rank) : name_(std::move(name)), rank_(rank) {}
  std::mutex mutex_;
  std::string name_;
  uint32_t rank_;
};

// Owning wrappers: construction creates the lock and stops the process if it
// could not be created.
class RWLockPtr {
 public:
  RWLockPtr(std::string name, uint32_t rank);
  RWLock& operator*() const { return *lock_; }
  RWLock* operator->() const { return lock_.get(); }

 private:
  std::unique_ptr<RWLock> lock_;
};

class ExclLockPtr {
 public:
  ExclLockPtr(std::string name, uint32_t rank);
  ExclLock& operator*() const { return *lock_; }
  ExclLock* operator->() const { return lock_.get(); }

 private:
  std::unique_ptr<ExclLock> lock_;
};

// Scoped holders.
class ReadGuard {
 public:
  explicit ReadGuard(RWLock& lock) : lock_(lock) { lock_.AcquireRead(); }
  ~ReadGuard() { lock_.ReleaseRead(); }
  ReadGuard(const ReadGuard&) = delete;
  ReadGuard& operator=(const ReadGuard&) = delete;

 private:
  RWLock& lock_;
};

class WriteGuard {
 public:
  explicit WriteGuard(RWLock& lock) : lock_(lock) { lock_.AcquireWrite(); }
  ~WriteGuard() { lock_.ReleaseWrite(); }
  WriteGuard(const WriteGuard&) = delete;
  WriteGuard& operator=(const WriteGuard&) = delete;

 private:
  RWLock& lock_;
};

class ExclGuard {
 public:
  explicit ExclGuard(ExclLock& lock) : lock_(lock) { lock_.Acquire(); }
  ~ExclGuard() { lock_.Release(); }
  ExclGuard(const ExclGuard&) = delete;
  ExclGuard& operator=(const ExclGuard&) = delete;

 private:
  ExclLock& lock_;
};

}  // namespace UserLock
