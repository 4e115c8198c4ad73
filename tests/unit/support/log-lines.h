#pragma once

#include <string>
#include <vector>

#include "tests/unit/support/log-capture.h"

/* The captured texts with source line numbers hidden, "LINE-#", so that whole runs of lines can be compared.
 */
std::vector<std::string> without_line_numbers(const log_capture_c &capture);

/* The error line as without_line_numbers shows it. */
std::string error_line(const std::string &source, const std::string &func, int code, int error_number = 0);
