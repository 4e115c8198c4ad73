#pragma once

#include <string>
#include <vector>

/* What has been logged since the last look: texts without their tags. */
std::vector<std::string> kept_log_take();
