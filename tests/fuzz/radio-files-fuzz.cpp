#include <string>
#include <sys/mman.h>
#include <unistd.h>

#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-convert.h"
#include "amt/amt-device/device-request.h"
#include "amt/amt-handle/at/at-handler.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/request/identity-store.h"
#include "amt/amt-packet.h"
#include "pub/error.h"
#include "tests/fuzz/support/handset-files.h"
#include "tests/fuzz/support/input.h"

/*
 * The input is a run of operations on the radios' files: what they hold is put there, read and written by packets
 * and by AT texts, and copied into the driver's file. What each must give is made once more here.
 */
namespace {

constexpr size_t MOST_OPERATIONS = 24;
constexpr size_t LINE_MOST = 98;
constexpr size_t ADDRESS_MOST = 59;
constexpr size_t QUOTED_MOST = 19;
constexpr size_t COPIED_MOST = 100;

const std::string BT_FILE = "/amt/BT/BT_Address.txt";
const std::string BT_FILE_2 = "/mnt/opl/nvm/BT_Address.txt";
const std::string WIFI_FILE = "/amt/WIFI/WIFI_nvram.txt";
const std::string STOCK_FILE = "/system/etc/wifi/nvram.txt";
const std::string STOCK_FILE_2 = "/system/etc/wifi/bcmdhd.cal";
const std::string DRIVER_FILE = "/data/misc/wifi/nvram.txt";
const std::string *const FILE_LIST[] = {&BT_FILE, &BT_FILE_2, &WIFI_FILE, &STOCK_FILE, &STOCK_FILE_2};

const std::string OK = "\r\nOK\r\n";
const std::string CME = "\r\n+CME ERROR: 100\r\n";

amt_buf_st g_req;
amt_buf_st g_rsp;
int g_line = -1;

bool is_blank(char character)
{
    return character == ' ' || (character >= '\t' && character <= '\r');
}

std::string file_content(const std::string &path)
{
    std::string content;
    handset_files_get(path, &content);
    return content;
}

bool is_file(const std::string &path)
{
    std::string content;
    return handset_files_get(path, &content);
}

/* The first word of a file; false when it has none. */
bool first_word(const std::string &path, size_t most, std::string *word_ptr)
{
    const std::string content = file_content(path);
    size_t place = 0;
    while (place < content.size() && is_blank(content[place])) {
        place++;
    }
    word_ptr->clear();
    for (size_t i = place; i < content.size() && word_ptr->size() < most; i++) {
        if (is_blank(content[i]) || content[i] == '\0') {
            break;
        }
        *word_ptr += content[i];
    }
    return place < content.size();
}

/* The first line, its end kept, as a C text; false when there is nothing to read. */
bool first_line(const std::string &path, size_t most, std::string *line_ptr)
{
    const std::string content = file_content(path);
    const size_t end = content.find('\n');
    const std::string line = content.substr(0, end == std::string::npos ? end : end + 1).substr(0, most);
    *line_ptr = line.substr(0, line.find('\0'));
    return !line.empty();
}

/* The stored Wi-Fi address, less the last character of its line. */
bool wifi_address(std::string *address_ptr)
{
    const bool is_read = first_line(WIFI_FILE, LINE_MOST, address_ptr);
    if (!address_ptr->empty()) {
        address_ptr->pop_back();
    }
    address_ptr->resize(address_ptr->size() < ADDRESS_MOST ? address_ptr->size() : ADDRESS_MOST);
    return is_read;
}

void open_line()
{
    if (g_line < 0) {
        g_line = memfd_create("line", MFD_CLOEXEC);
        FUZZ_REQUIRE(g_line > 0);
    }
    FUZZ_REQUIRE(ftruncate(g_line, 0) == 0 && lseek(g_line, 0, SEEK_SET) == 0);
    g_handle_context.m_fd_pc = g_line;
    g_handle_context.m_pty.m_ptm_fd = g_line;
}

/* What has been said on the line. */
std::string said()
{
    char text_a[AMT_PACKET_SIZE];
    const ssize_t count = pread(g_line, text_a, sizeof(text_a), 0);
    FUZZ_REQUIRE(count >= 0);
    return {text_a, static_cast<size_t>(count)};
}

/* A request of the app's: its status. The answer, if there is one, stands on the line. */
int ask(amt_handle_func handler, uint8_t command, uint8_t operation_atom, int32_t operation,
        uint8_t address_atom, const std::string &address)
{
    amt_handle_clear_buf(&g_req);
    amt_handle_clear_buf(&g_rsp);
    amt_packet_init(g_req.m_buf_a, command);
    amt_packet_add_int(g_req.m_buf_a, operation_atom, operation);
    amt_packet_add_bytes(g_req.m_buf_a, address_atom, reinterpret_cast<const uint8_t *>(address.data()),
                         static_cast<uint16_t>(address.size()));
    g_req.m_buf_len = amt_packet_get_length(g_req.m_buf_a);
    open_line();
    return handler(AMT_CHANNEL_APP, &g_req, &g_rsp);
}

/* The answer shows this address and the result 0, and nothing else. */
void require_address(uint8_t response, uint8_t atom, const std::string &address)
{
    uint8_t packet_a[AMT_PACKET_SIZE] = {};
    amt_packet_init(packet_a, response);
    amt_packet_add_string(packet_a, atom, address.c_str());
    amt_packet_add_int(packet_a, AMT_ATOM_RESULT, 0);
    const std::string wanted(reinterpret_cast<const char *>(packet_a), amt_packet_get_length(packet_a));
    FUZZ_REQUIRE(said() == wanted);
}

void read_by_packet(bool is_bt)
{
    std::string address;
    if (is_bt) {
        const bool is_good = first_word(BT_FILE, ADDRESS_MOST, &address);
        const int status =
            ask(amt_device_bt_address, AMT_BLUETOOTH_ADDRESS_CMD, AMT_ATOM_BT_OPERATION, 1, 3, "");
        FUZZ_REQUIRE(status == (is_good ? PUB_ERR_NONE : is_file(BT_FILE) ? PUB_ERR_FAIL : PUB_ERR_PARAM));
        if (is_good) {
            require_address(AMT_BLUETOOTH_ADDRESS_RSPCMD, AMT_ATOM_BT_ADDRESS, address);
        }
        return;
    }
    const bool is_good = wifi_address(&address);
    const int status = ask(amt_device_wifi_address, AMT_WIFI_TEST_CMD, AMT_ATOM_WIFI_OPERATION, 0, 3, "");
    FUZZ_REQUIRE(status == (is_good ? PUB_ERR_NONE : PUB_ERR_FAIL));
    if (is_good) {
        require_address(AMT_WIFI_TEST_RSPCMD, AMT_ATOM_WIFI_ADDRESS, address);
    }
}

void write_by_packet(bool is_bt, const std::string &given)
{
    const std::string taken = given.substr(0, ADDRESS_MOST);
    const std::string text = taken.substr(0, taken.find('\0'));
    const std::string before = file_content(is_bt ? BT_FILE : WIFI_FILE);
    if (is_bt) {
        const bool is_good = !taken.empty() && text == taken;
        const int status = ask(amt_device_bt_address, AMT_BLUETOOTH_ADDRESS_CMD, AMT_ATOM_BT_OPERATION, 2,
                               AMT_ATOM_BT_ADDRESS, given);
        FUZZ_REQUIRE(status == (is_good ? PUB_ERR_NONE : PUB_ERR_PARAM));
        FUZZ_REQUIRE(file_content(BT_FILE) == (is_good ? text + "\n" : ""));
        return;
    }
    const int status = ask(amt_device_wifi_address, AMT_WIFI_TEST_CMD, AMT_ATOM_WIFI_OPERATION, 1,
                           AMT_ATOM_WIFI_ADDRESS, given);
    FUZZ_REQUIRE(status == (text.empty() ? PUB_ERR_FAIL : PUB_ERR_NONE));
    FUZZ_REQUIRE(file_content(WIFI_FILE) == (text.empty() ? before : text + "\n"));
}

void read_by_text(bool is_bt)
{
    std::string address;
    const bool is_good = is_bt ? first_word(is_file(BT_FILE) ? BT_FILE : BT_FILE_2, LINE_MOST + 1, &address)
                               : wifi_address(&address);
    const std::string name = is_bt ? "DBTADDR" : "DWIFIADDR";
    open_line();
    FUZZ_REQUIRE((is_bt ? amt_at_read_bt_address("") : amt_at_read_wifi_address("")) == PUB_ERR_NONE);
    FUZZ_REQUIRE(said() == (is_good ? "\r\n^" + name + ": \"" + address + "\"\r\n" + OK : CME));
}

void write_by_text(bool is_bt, const std::string &given)
{
    const std::string text =
        given.substr(0, given.find_first_of(std::string("\"\r\n\0", 4))).substr(0, QUOTED_MOST);
    const std::string path = !is_bt                                    ? WIFI_FILE
                             : is_file(BT_FILE) || !is_file(BT_FILE_2) ? BT_FILE
                                                                       : BT_FILE_2;
    const std::string before = file_content(path);
    open_line();
    const int status =
        is_bt ? amt_at_write_bt_address(given.c_str()) : amt_at_write_wifi_address(given.c_str());
    FUZZ_REQUIRE(status == (is_bt && text.empty() ? PUB_ERR_PARAM : PUB_ERR_NONE));
    FUZZ_REQUIRE(said() == (!text.empty() ? OK : is_bt ? "" : CME));
    FUZZ_REQUIRE(file_content(path) == (text.empty() ? before : text + "\n"));
}

/* The stock file with the stored address in place of its own. */
void copy_calibration()
{
    std::string stored;
    const bool is_readable = first_line(WIFI_FILE, ADDRESS_MOST, &stored) || !is_file(WIFI_FILE);
    const std::string stock = file_content(is_file(STOCK_FILE) ? STOCK_FILE : STOCK_FILE_2);
    std::string wanted;
    size_t copied = 0;
    bool is_replaced = false;
    for (size_t place = 0; place < stock.size() && copied < COPIED_MOST;) {
        const size_t end = stock.find('\n', place);
        const std::string line =
            stock.substr(place, end == std::string::npos ? end : end + 1 - place).substr(0, LINE_MOST);
        place += line.size();
        const size_t text = line.find_first_not_of(' ');
        const bool is_address =
            !stored.empty() && text != std::string::npos && line.compare(text, 8, "macaddr=") == 0;
        wanted += is_address ? "macaddr=" + stored : line;
        copied += is_address ? 0 : 1;
        is_replaced = is_replaced || is_address;
    }
    wanted += stored.empty() || is_replaced ? "" : "macaddr=" + stored;
    const bool is_stock = is_file(STOCK_FILE) || is_file(STOCK_FILE_2);
    const int status = amt_write_wifi_to_nvram_file();
    const bool is_good = is_readable && is_stock && copied < COPIED_MOST;
    FUZZ_REQUIRE(status == (is_good ? PUB_ERR_NONE : PUB_ERR_FAIL));
    FUZZ_REQUIRE(file_content(DRIVER_FILE) == (is_stock ? wanted : ""));
}

std::string take_string(fuzz_input_c *input_ptr, size_t most)
{
    const std::vector<uint8_t> taken = input_ptr->take(input_ptr->take_u16() % (most + 1));
    return {taken.begin(), taken.end()};
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    fuzz_input_c input(data, size);
    handset_files_begin();
    for (size_t i = 0; i < MOST_OPERATIONS && !input.is_empty(); i++) {
        const uint8_t choice = input.take_u8();
        const bool is_bt = (choice >> 4 & 1) != 0;
        switch (choice % 8) {
        case 0:
        case 1:
            handset_files_put(*FILE_LIST[input.take_u8() % 5], take_string(&input, 4096));
            break;
        case 2:
            read_by_packet(is_bt);
            break;
        case 3:
            write_by_packet(is_bt, take_string(&input, 200));
            break;
        case 4:
            read_by_text(is_bt);
            break;
        case 5:
            write_by_text(is_bt, take_string(&input, 200));
            break;
        default:
            copy_calibration();
            break;
        }
    }
    FUZZ_REQUIRE(handset_files_power_offs() == 0);
    handset_files_end();
    return 0;
}
