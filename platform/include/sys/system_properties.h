// Host implementation of the platform's system properties: one file each in the device root.
#pragma once

#define PROP_VALUE_MAX 92

#ifdef __cplusplus
extern "C" {
#endif

// Copies the value, at most 91 bytes and a terminator, and returns its length; the empty string and
// 0 when the property is unset or cannot be read.
int __system_property_get(const char* name, char* value);

// Returns 0 when the new value stands, otherwise -1: a name or value the platform does not take, a
// "ro." property that has a value already, or a store that cannot be written.
int __system_property_set(const char* name, const char* value);

#ifdef __cplusplus
}
#endif
