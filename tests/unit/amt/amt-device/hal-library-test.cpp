#include "amt/amt-device/hal-library.h"

#include <dlfcn.h>
#include <math.h>

#include <gtest/gtest.h>

#include "pub/error.h"
#include "tests/unit/support/log-lines.h"

namespace {

constexpr char HANDLER[] = "some_handler";

/* A library that this machine has; the test program does not need it to be loaded already. */
constexpr char LIBRARY[] = "libm.so.6";

TEST(hal_library, loads_an_entry_and_unloads_it)
{
    const log_capture_c capture;
    amt_hal_entry_st entry = {};
    ASSERT_EQ(amt_hal_load(LIBRARY, "fabs", &entry, {g_amt_device_log, HANDLER}), PUB_ERR_NONE);
    using fabs_func = double (*)(double);
    EXPECT_EQ(reinterpret_cast<fabs_func>(entry.m_entry_ptr)(-2.0), 2.0);
    amt_hal_unload(&entry);
    EXPECT_EQ(entry.m_library_ptr, nullptr);
    EXPECT_EQ(entry.m_entry_ptr, nullptr);
    EXPECT_TRUE(capture.texts().empty());
}

TEST(hal_library, tells_a_missing_library)
{
    const log_capture_c capture;
    amt_hal_entry_st entry = {};
    EXPECT_EQ(amt_hal_load("/no/such/library.so", "entry", &entry, {g_amt_device_log, HANDLER}),
              PUB_ERR_FILE);
    const std::vector<std::string> lines = without_line_numbers(capture);
    ASSERT_EQ(lines.size(), 2U);
    EXPECT_EQ(lines[0].find("FILE-amt/amt-device, LINE-#, FUNC-some_handler(), error_code=-118"), 0U);
    EXPECT_EQ(lines[1], "call dlopen fail: - /no/such/library.so: cannot open shared object file: "
                        "No such file or directory");
    EXPECT_EQ(entry.m_library_ptr, nullptr);
}

TEST(hal_library, leaves_the_library_loaded_when_the_entry_is_missing)
{
    const log_capture_c capture;
    amt_hal_entry_st entry = {};
    EXPECT_EQ(amt_hal_load(LIBRARY, "no_such_entry", &entry, {g_amt_device_log, HANDLER}), PUB_ERR_FILE);
    const std::vector<std::string> lines = without_line_numbers(capture);
    ASSERT_EQ(lines.size(), 2U);
    EXPECT_EQ(lines[1].find("call dlopen fail: - "), 0U);
    EXPECT_NE(lines[1].find("undefined symbol: no_such_entry"), std::string::npos);
    ASSERT_NE(entry.m_library_ptr, nullptr);
    EXPECT_NE(dlsym(entry.m_library_ptr, "fabs"), nullptr);
    dlclose(entry.m_library_ptr);
}

} // namespace
