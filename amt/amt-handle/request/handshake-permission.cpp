#include "amt/amt-handle/request/handshake-permission.h"

#include <stdlib.h>

#include "amt/amt-handle/channel/factory-file.h"
#include "amt/amt-handle/request/identity-store.h"
#include "amt/amt-log.h"
#include "pub/error.h"

namespace {

/* Makes the digit durable. The log says which step failed. */
int amt_write_content_to_file_sync(const char *digit)
{
    if (const int status = amt_factory_file_store(AMT_PERMISSION_FILE, digit); status != PUB_ERR_NONE) {
        return status;
    }
    PUB_LOG(g_amt_handle_log, "Writed to file(%s) success.flag: %s.", AMT_PERMISSION_FILE, digit);
    return PUB_ERR_NONE;
}

} // namespace

int handle_amt_damt1_operation(int operation, int *flag_ptr)
{
    char text_a[AMT_PERMISSION_TEXT_SIZE];
    bool is_read = false;
    switch (static_cast<amt_permission_en>(operation)) {
    case amt_permission_en::FORBID:
    case amt_permission_en::PERMIT:
        if (amt_write_content_to_file_sync(operation == 0 ? "0" : "1") != PUB_ERR_NONE) {
            return pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL,
                                "write error to do-not-permit-handshake file.");
        }
        *flag_ptr = operation;
        return PUB_ERR_NONE;
    case amt_permission_en::READ:
        *flag_ptr = amt_permission_read(text_a, &is_read);
        return PUB_ERR_NONE;
    }
    return pub_log_fail(g_amt_handle_log, PUB_ERR_PARAM, "unknown operation type: %u",
                        static_cast<unsigned>(operation));
}

int amt_permission_read(char *text_ptr, bool *is_read_ptr)
{
    const int status = amt_read_data_from_file(text_ptr, AMT_PERMISSION_TEXT_SIZE, AMT_PERMISSION_FILE);
    *is_read_ptr = status == PUB_ERR_NONE;
    return *is_read_ptr ? atoi(text_ptr) : static_cast<int>(amt_permission_en::PERMIT);
}
