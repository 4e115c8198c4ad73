#include "amt/amt-handle/channel/identity-slots.h"

#include <mutex>
#include <string.h>

namespace {

struct identity_slots_st
{
    char m_imei_a[AMT_IDENTITY_TEXT_SIZE];
    char m_sn_a[AMT_IDENTITY_TEXT_SIZE];
    uint8_t m_channel;
    int m_pending_kind;
};

std::mutex g_lock;
identity_slots_st g_slots;

/* Null for a kind that has no text. Requires the lock. */
char *find_text(int kind)
{
    if (kind == AMT_IDENTITY_IMEI) {
        return g_slots.m_imei_a;
    }
    return kind == AMT_IDENTITY_SN ? g_slots.m_sn_a : nullptr;
}

} // namespace

void amt_identity_reset()
{
    const std::lock_guard<std::mutex> guard(g_lock);
    g_slots = {};
}

void amt_identity_set_text(int kind, const char *text, uint32_t length)
{
    char text_a[AMT_IDENTITY_TEXT_SIZE] = {};
    if (text != nullptr) {
        const size_t limit = length < sizeof(text_a) - 1 ? length : sizeof(text_a) - 1;
        memcpy(text_a, text, strnlen(text, limit));
    }
    const std::lock_guard<std::mutex> guard(g_lock);
    char *const slot_ptr = find_text(kind);
    if (slot_ptr != nullptr) {
        memcpy(slot_ptr, text_a, sizeof(text_a));
    }
}

void amt_identity_get_text(int kind, char *out)
{
    memset(out, 0, AMT_IDENTITY_TEXT_SIZE);
    const std::lock_guard<std::mutex> guard(g_lock);
    const char *const slot_ptr = find_text(kind);
    if (slot_ptr != nullptr) {
        memcpy(out, slot_ptr, AMT_IDENTITY_TEXT_SIZE);
    }
}

void amt_identity_set_channel(uint8_t channel)
{
    const std::lock_guard<std::mutex> guard(g_lock);
    g_slots.m_channel = channel;
}

uint8_t amt_identity_get_channel()
{
    const std::lock_guard<std::mutex> guard(g_lock);
    return g_slots.m_channel;
}

void amt_identity_set_pending(int kind)
{
    const std::lock_guard<std::mutex> guard(g_lock);
    g_slots.m_pending_kind = kind;
}

int amt_identity_get_pending()
{
    const std::lock_guard<std::mutex> guard(g_lock);
    return g_slots.m_pending_kind;
}
