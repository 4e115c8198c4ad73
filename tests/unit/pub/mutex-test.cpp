#include "pub/util/mutex.h"

#include <mutex>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace {

TEST(pub_mutex, keeps_threads_apart)
{
    constexpr int THREADS = 4;
    constexpr int ROUNDS = 20000;
    pub_mutex_c mutex;
    int count = 0; /* no atomic: only the mutex keeps the increments whole */
    std::vector<std::thread> thread_list;
    for (int i = 0; i < THREADS; i++) {
        thread_list.emplace_back([&] {
            for (int round = 0; round < ROUNDS; round++) {
                const std::lock_guard<pub_mutex_c> guard(mutex);
                count++;
            }
        });
    }
    for (std::thread &thread : thread_list) {
        thread.join();
    }
    EXPECT_EQ(count, THREADS * ROUNDS);
}

TEST(pub_mutex, that_is_held_refuses_everybody)
{
    pub_mutex_c mutex;
    ASSERT_TRUE(mutex.try_lock());
    EXPECT_FALSE(mutex.try_lock()) << "on the thread that holds it";
    bool is_taken = true;
    std::thread([&] { is_taken = mutex.try_lock(); }).join();
    EXPECT_FALSE(is_taken);
    mutex.unlock();
    EXPECT_TRUE(mutex.try_lock());
    mutex.unlock();
}

} // namespace
