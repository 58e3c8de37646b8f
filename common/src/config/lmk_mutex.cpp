#include <lumicor/lmk.h>

#include <new>

#include "common/src/internal/memory.h"

uint32_t LmkMutex::Create() {
    if (m_pMutex) return LMK_STATUS_OK;

    std::unique_ptr<pthread_mutex_t> mutex(new (std::nothrow) pthread_mutex_t);
    if (!mutex) return LMK_STATUS_OUT_OF_MEMORY;

    pthread_mutexattr_t attr;
    if (pthread_mutexattr_init(&attr) != 0) return LMK_STATUS_FAILED;
    auto destroyAttr = lmk::MakeScopeGuard([&attr] { pthread_mutexattr_destroy(&attr); });
    // Recursive: Log reads configuration values while the caller may already
    // hold the same locks further up.
    if (pthread_mutexattr_settype(&attr, PTHREAD_MUTEX_RECURSIVE) != 0) return LMK_STATUS_FAILED;
    // A mutex that failed to initialise must never be stored: locking it
    // would be undefined.
    if (pthread_mutex_init(mutex.get(), &attr) != 0) return LMK_STATUS_FAILED;

    m_pMutex = mutex.release();
    return LMK_STATUS_OK;
}

void LmkMutex::Delete() {
    if (!m_pMutex) return;
    pthread_mutex_destroy(m_pMutex);
    delete m_pMutex;
    m_pMutex = nullptr;
}

uint32_t LmkMutex::Lock() {
    if (!m_pMutex) return LMK_STATUS_FAILED;
    return pthread_mutex_lock(m_pMutex) == 0 ? LMK_STATUS_OK : LMK_STATUS_FAILED;
}

void LmkMutex::Unlock() {
    if (m_pMutex) pthread_mutex_unlock(m_pMutex);
}
