#include "tests/fuzz/support/scripted-ldt.h"

#include <stddef.h>

#include "platform/include/ldt.h"

namespace {

std::vector<int8_t> g_statuses;
size_t g_calls = 0;

int32_t next_status()
{
    const size_t call = g_calls++;
    return call < g_statuses.size() ? g_statuses[call] : 0;
}

void store(int32_t *out)
{
    if (out != nullptr) {
        *out = static_cast<int32_t>(g_calls);
    }
}

} // namespace

void scripted_ldt_set(const std::vector<int8_t> &statuses)
{
    g_statuses = statuses;
    g_calls = 0;
}

int32_t ldt_btCtrl(int32_t)
{
    return next_status();
}

int32_t ldt_btCheck(void)
{
    return next_status();
}

int32_t ldt_wifiCtrl(int32_t)
{
    return next_status();
}

int32_t ldt_wifiCheck(void)
{
    return next_status();
}

int32_t ldt_TxTest(int32_t, int32_t, int32_t, int32_t)
{
    return next_status();
}

int32_t ldt_RxTest(int32_t, int32_t, int32_t, int32_t *count_out)
{
    store(count_out);
    return next_status();
}

int32_t ldt_gpsCtrl(int32_t, int32_t, int32_t *svid_out, int32_t *cnr_out)
{
    store(svid_out);
    store(cnr_out);
    return next_status();
}

int32_t ldt_gpsCheck(void)
{
    return next_status();
}
