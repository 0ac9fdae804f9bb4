#include "platform/util/userlock.h"

#include <algorithm>
#include <vector>

#include "platform/util/panic.h"

namespace UserLock {
namespace Rank {
namespace {

struct Held {
  const void* lock;
  const std::string* name;
  uint32_t rank;
};

thread_local std::vector<Held> tHeld;

}  // namespace

void NoteAcquire(const void* lock, const std::string& name, uint32_t rank) {
#ifdef ZYRD_LOCK_RANK_CHECK
  if (rank == kRankUnranked) return;
  for (const Held& h : tHeld) {
    if (h.rank >= rank) {
      Panic("Lock rank violation: acquiring '%s' (rank 0x%x) while holding '%s' (rank 0x%x)\n",
            name.c_str(), rank, h.name->c_str(), h.rank);
    }
  }
  tHeld.push_back({lock, &name, rank});
#else
  (void)lock, (void)name, (void)rank;
#endif
}

void NoteRelease(const void* lock) {
#ifdef ZYRD_LOCK_RANK_CHECK
  auto it = std::find_if(tHeld.rbegin(), tHeld.rend(),
                         [lock](const Held& h) { return h.lock == lock; });
  if (it != tHeld.rend()) tHeld.erase(std::next(it).base());
#else
  (void)lock;
#endif
}

size_t HeldCount() { return tHeld.size(); }

}  // namespace Rank

std::unique_ptr<RWLock> RWLock::Create(std::string name, uint32_t rank) {
  return std::unique_ptr<RWLock>(new RWLock(std::move(name), rank));
}

void RWLock::AcquireRead() {
  Rank::NoteAcquire(this, name_, rank_);
  mutex_.lock_shared();
}

void RWLock::ReleaseRead() {
  mutex_.unlock_shared();
  Rank::NoteRelease(this);
}

void RWLock::AcquireWrite() {
  Rank::NoteAcquire(this, name_, rank_);
  mutex_.lock();
}

void RWLock::ReleaseWrite() {
  mutex_.unlock();
  Rank::NoteRelease(this);
}

std::unique_ptr<ExclLock> ExclLock::Create(std::string name, uint32_t rank) {
  return std::unique_ptr<ExclLock>(new ExclLock(std::move(name), rank));
}

void ExclLock::Acquire() {
  Rank::NoteAcquire(this, name_, rank_);
  mutex_.lock();
}

void ExclLock::Release() {
  mutex_.unlock();
  Rank::NoteRelease(this);
}

RWLockPtr::RWLockPtr(std::string name, uint32_t rank)
    : lock_(RWLock::Create(std::move(name), rank)) {
  VERIFY(lock_ != nullptr);
}

ExclLockPtr::ExclLockPtr(std::string name, uint32_t rank)
    : lock_(ExclLock::Create(std::move(name), rank)) {
  VERIFY(lock_ != nullptr);
}

}  // namespace UserLock
