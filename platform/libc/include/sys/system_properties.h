// Host implementation of the platform's system properties: files in the device root.
#pragma once

#define PROP_VALUE_MAX 92

#ifdef __cplusplus
extern "C" {
#endif

// Copies the value, at most 91 bytes and a terminator, into a buffer of PROP_VALUE_MAX bytes and
// returns its length. The empty string and 0 when the property is unset or cannot be read.
int __system_property_get(const char* name, char* value);

// Returns 0 when the value is stored. -1 for a name or value that the platform rejects, for a "ro."
// property that has a value already, and when the file cannot be written.
int __system_property_set(const char* name, const char* value);

#ifdef __cplusplus
}
#endif
