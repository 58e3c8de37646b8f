// Scoped locking of an LmkMutex for the configuration and the log.
#ifndef LUMICOR_COMMON_CONFIG_LMK_LOCK_H
#define LUMICOR_COMMON_CONFIG_LMK_LOCK_H

#include <lumicor/lmk.h>

namespace lmk {

// Holds the mutex for the scope when it exists. Before the first
// Initialize/Start (or after the last Finalize/Stop) there is no mutex; the
// maps are then used unlocked, which is safe because the reference counts may
// only change on a single thread anyway. A mutex that exists but cannot be
// locked makes the scope unusable: the caller must not touch shared state.
class LmkScopedLock {
public:
    explicit LmkScopedLock(LmkMutex& mutex)
        : mutex_(mutex), locked_(mutex.IsCreated() && mutex.Lock() == LMK_STATUS_OK),
          usable_(locked_ || !mutex.IsCreated()) {}
    ~LmkScopedLock() {
        if (locked_) mutex_.Unlock();
    }
    LmkScopedLock(const LmkScopedLock&) = delete;
    LmkScopedLock& operator=(const LmkScopedLock&) = delete;

    bool usable() const { return usable_; }

private:
    LmkMutex& mutex_;
    const bool locked_;
    const bool usable_;
};

}  // namespace lmk

#endif
