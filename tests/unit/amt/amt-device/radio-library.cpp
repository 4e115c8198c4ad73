#include "tests/unit/amt/amt-device/radio-library.h"

#include "platform/include/ldt.h"

namespace {

constexpr int32_t NO_LIBRARY = -9;

radio_library_c *g_library = nullptr;

std::string place(const int32_t *pointer)
{
    return pointer == nullptr ? "null" : "out";
}

int32_t answer(const std::string &call)
{
    if (g_library == nullptr) {
        return NO_LIBRARY;
    }
    g_library->m_calls.push_back(call);
    if (g_library->m_in_call) {
        g_library->m_in_call();
    }
    return g_library->m_answer;
}

std::string list(const std::string &name, const std::vector<int32_t> &numbers, const std::string &rest = "")
{
    std::string text = name + "(";
    for (const int32_t number : numbers) {
        text += (text.back() == '(' ? "" : ", ") + std::to_string(number);
    }
    return text + rest + ")";
}

void store(int32_t *out, int32_t value)
{
    if (out != nullptr) {
        *out = value;
    }
}

} // namespace

radio_library_c::radio_library_c()
{
    g_library = this;
}

radio_library_c::~radio_library_c()
{
    g_library = nullptr;
}

std::vector<std::string> radio_library_c::take_calls()
{
    std::vector<std::string> calls;
    calls.swap(m_calls);
    return calls;
}

int32_t ldt_btCtrl(int32_t on)
{
    return answer(list("ldt_btCtrl", {on}));
}

int32_t ldt_btCheck(void)
{
    return answer(list("ldt_btCheck", {}));
}

int32_t ldt_wifiCtrl(int32_t on)
{
    return answer(list("ldt_wifiCtrl", {on}));
}

int32_t ldt_wifiCheck(void)
{
    return answer(list("ldt_wifiCheck", {}));
}

int32_t ldt_TxTest(int32_t on, int32_t power, int32_t rate, int32_t channel)
{
    return answer(list("ldt_TxTest", {on, power, rate, channel}));
}

int32_t ldt_RxTest(int32_t on, int32_t channel, int32_t rate, int32_t *count_out)
{
    store(count_out, g_library == nullptr ? 0 : g_library->m_count);
    return answer(list("ldt_RxTest", {on, channel, rate}, ", " + place(count_out)));
}

int32_t ldt_gpsCtrl(int32_t operation, int32_t index, int32_t *svid_out, int32_t *cnr_out)
{
    store(svid_out, g_library == nullptr ? 0 : g_library->m_svid);
    store(cnr_out, g_library == nullptr ? 0 : g_library->m_cnr);
    return answer(list("ldt_gpsCtrl", {operation, index}, ", " + place(svid_out) + ", " + place(cnr_out)));
}

int32_t ldt_gpsCheck(void)
{
    return answer(list("ldt_gpsCheck", {}));
}
