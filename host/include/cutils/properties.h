// System properties on a Linux host.
//
// A host has no property service, so properties are read from the
// environment: the property "a.b.c" is the variable KIV_PROP_a_b_c (the
// prefix KIV_PROP_, then the key with every '.' turned into '_'), e.g.
// ro.board.platform <- KIV_PROP_ro_board_platform. An unset or empty
// variable reads as the default. Same signatures as Android's libcutils.
#ifndef KIV_HOST_CUTILS_PROPERTIES_H
#define KIV_HOST_CUTILS_PROPERTIES_H

#ifdef __cplusplus
extern "C" {
#endif

#define PROPERTY_KEY_MAX 32
#define PROPERTY_VALUE_MAX 92

// Copies the value (or default_value, or "" when that is null) into value,
// which holds PROPERTY_VALUE_MAX bytes; longer values are cut to
// PROPERTY_VALUE_MAX - 1 characters. Returns the length copied.
int property_get(const char* key, char* value, const char* default_value);

#ifdef __cplusplus
}
#endif

#endif
