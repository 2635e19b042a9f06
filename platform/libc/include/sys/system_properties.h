// Host implementation of the platform's system properties: files in the device root.
#pragma once

#define PROP_VALUE_MAX 92

#ifdef __cplusplus
extern "C" {
#endif

// Copies the value, at most 91 bytes and a terminator, into a buffer of PROP_VALUE_MAX bytes and
// returns its length. If the property is unset or unreadable, the value is empty.
int __system_property_get(const char* name, char* value);

// Returns 0 on success, or -1 if the name or value is invalid, a "ro." property is already set, or
// the file cannot be written.
int __system_property_set(const char* name, const char* value);

#ifdef __cplusplus
}
#endif
