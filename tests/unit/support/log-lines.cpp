#include "tests/unit/support/log-lines.h"

#include <ctype.h>

std::vector<std::string> without_line_numbers(const log_capture_c &capture)
{
    static const std::string title = ", LINE-";
    std::vector<std::string> text_list = capture.texts();
    for (std::string &text : text_list) {
        const size_t found = text.find(title);
        if (text.rfind("FILE-", 0) != 0 || found == std::string::npos) {
            continue;
        }
        const size_t begin = found + title.size();
        size_t end = begin;
        while (end < text.size() && isdigit(static_cast<unsigned char>(text[end])) != 0) {
            end++;
        }
        if (end > begin) {
            text.replace(begin, end - begin, "#");
        }
    }
    return text_list;
}

std::string error_line(const std::string &source, const std::string &func, int code, int error_number)
{
    return "FILE-" + source + ", LINE-#, FUNC-" + func + "(), error_code=" + std::to_string(code) +
           ", errno=" + std::to_string(error_number);
}
