#include "platform/include/cutils/properties.h"

#include <stdint.h>
#include <string.h>

#include "platform/host/stand-in/stand-in.h"

/* A property is a file in the directory of properties; its content is the value. An empty file is an unset
 * property. */

namespace {

/* The file of a property; false for a name that cannot be one. */
bool property_path(char *path, const char *key)
{
    const size_t length = key == nullptr ? 0 : strnlen(key, PROPERTY_KEY_MAX);
    const bool is_name =
        length != 0 && length < PROPERTY_KEY_MAX && key[0] != '.' && strchr(key, '/') == nullptr;
    return is_name && stand_in_path(path, STAND_IN_PROPERTIES, key);
}

uint32_t read_property(const char *key, char *value)
{
    char path_a[STAND_IN_PATH_SIZE];
    int32_t length = -1;
    if (property_path(path_a, key)) {
        length = stand_in_read_file(path_a, value, PROPERTY_VALUE_MAX);
    }
    if (length <= 0) {
        return 0;
    }
    /* A line end is what an editor or echo left there. */
    return static_cast<uint32_t>(length) - (value[length - 1] == '\n');
}

} // namespace

STAND_IN_INTERFACE int property_get(const char *key, char *value, const char *default_value)
{
    size_t length = read_property(key, value);
    if (length == 0 && default_value != nullptr) {
        length = strnlen(default_value, PROPERTY_VALUE_MAX - 1);
        memcpy(value, default_value, length);
    }
    value[length] = '\0';
    return static_cast<int>(length);
}

STAND_IN_INTERFACE int property_set(const char *key, const char *value)
{
    const char *text = value != nullptr ? value : "";
    const size_t length = strnlen(text, PROPERTY_VALUE_MAX);
    char path_a[STAND_IN_PATH_SIZE];
    stand_in_answer_st answer;
    int status = stand_in_take_answer("property_set", &answer);
    if (status == 0) {
        const bool is_legal = length < PROPERTY_VALUE_MAX && property_path(path_a, key);
        status = is_legal ? stand_in_replace_file(path_a, text, static_cast<uint32_t>(length)) : -1;
    }
    stand_in_record("property_set(%s, %s) = %d", key != nullptr ? key : "null", text, status);
    return status;
}
