#include <gtest/gtest.h>

#include <lumicor/lmk.h>

#include <atomic>
#include <chrono>
#include <thread>

#include "testkit/fault.h"

namespace {

TEST(LmkMutexTest, RecursiveUntilTheLastUnlock) {
    LmkMutex mutex;
    ASSERT_EQ(mutex.Create(), LMK_STATUS_OK);
    ASSERT_EQ(mutex.Lock(), LMK_STATUS_OK);
    ASSERT_EQ(mutex.Lock(), LMK_STATUS_OK);  // a plain mutex would deadlock here
    mutex.Unlock();

    std::atomic<bool> acquired(false);
    std::thread other([&] {
        EXPECT_EQ(mutex.Lock(), LMK_STATUS_OK);
        acquired = true;
        mutex.Unlock();
    });
    std::this_thread::sleep_for(std::chrono::milliseconds(50));
    EXPECT_FALSE(acquired);  // still held once
    mutex.Unlock();
    other.join();
    EXPECT_TRUE(acquired);
    mutex.Delete();
}

TEST(LmkMutexTest, MissingMutexFailsToLockAndIgnoresUnlock) {
    LmkMutex mutex;
    EXPECT_EQ(mutex.Lock(), LMK_STATUS_FAILED);
    mutex.Unlock();
    {
        lumicor::test::FaultScope fail(1);
        EXPECT_EQ(mutex.Create(), LMK_STATUS_OUT_OF_MEMORY);
    }
    EXPECT_FALSE(mutex.IsCreated());
    ASSERT_EQ(mutex.Create(), LMK_STATUS_OK);
    mutex.Delete();
    EXPECT_FALSE(mutex.IsCreated());
    EXPECT_EQ(mutex.Lock(), LMK_STATUS_FAILED);
    mutex.Delete();  // twice: harmless
}

}  // namespace
