/* The platform's system properties (libcutils): short texts under short names, shared by all processes. */
#pragma once

/* Both sizes include the terminating zero. */
#define PROPERTY_KEY_MAX   32
#define PROPERTY_VALUE_MAX 92

extern "C" {
/**
 * Reads a property.
 * @param key           its name, at most 31 characters
 * @param value         receives the text, always terminated; PROPERTY_VALUE_MAX bytes, owned by the caller
 * @param default_value copied when the property is unset or empty; may be null (then the value is empty)
 * @return the length of what stands in value
 */
int property_get(const char *key, char *value, const char *default_value);

/**
 * Sets a property. Setting "ctl.stop" to the name of a service asks init to stop it.
 * @param key   its name, at most 31 characters
 * @param value its text, at most 91 characters
 * @return 0, or a negative value when it was not set
 */
int property_set(const char *key, const char *value);
}
