// Typed effect options: process-wide records with numeric keys, value checks
// and the parameter-string parsers.
#ifndef VCCORE_VC_OPTIONS_H
#define VCCORE_VC_OPTIONS_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

typedef enum {
    VCOPTION_TYPE_INTEGER = 0,
    VCOPTION_TYPE_FLOAT = 1,
    VCOPTION_TYPE_STRING = 2,
    VCOPTION_TYPE_ENUM = 3,
    // Only in value records: "no value".
    VCOPTION_TYPE_NONE = 4,
} VCOptionType_t;

// A tagged value: type word, 32-bit value word, reserved word.
typedef struct {
    int32_t type;
    union {
        int32_t i;
        float f;
    } value;
    int32_t reserved;
} VCOptionValue_t;

// One enumerated value; arrays end with value -1.
typedef struct {
    int32_t value;
    const char* name;
} VCOptionEnum_t;

// Lives for the whole process (usually a class-wide static); the registry never
// copies or frees it. Bounds 0…0 mean unbounded.
typedef struct {
    uint32_t key;  // 0 until registered
    const char* name;
    int32_t type;  // a VCOptionType_t; stored as a plain word so that any code survives a dump
    VCOptionValue_t min;
    VCOptionValue_t max;
    const VCOptionEnum_t* enumValues;
} VCOption_t;

// Keys count up from this value; the first option registered gets base + 1.
#define VCOPTION_KEY_BASE 0x13370000u

// 1 on success or when a record of the same name and type already holds a key
// (which is then shared); 0 for null or a key clash.
int VCOption_RegisterNew(VCOption_t* option);

VCOption_t* VCOption_FindByName(const char* name);
uint32_t VCOption_FindIdByName(const char* name);
VCOption_t* VCOption_FindById(uint32_t key);
const char* VCOption_FindNameById(uint32_t key);

// 1 valid, 0 invalid.
int VCOption_CheckValueI(const VCOption_t* option, int value);
int VCOption_CheckValueF(const VCOption_t* option, float value);
int VCOption_CheckValueS(const VCOption_t* option, const char* value);

// Value of `name` in "a=1,b=2"-style strings, or the default. Only the first
// occurrence of "name=" is considered, and only when it starts the string or
// follows a ','.
int VCOption_ParseStringI(const char* paramString, const char* name, int defaultValue);
float VCOption_ParseStringF(const char* paramString, const char* name, float defaultValue);

#ifdef __cplusplus
}  // extern "C"

// Sorts keys[lo..hi] ascending (inclusive) and applies the same exchanges to
// the parallel array of 256-character names.
void sort(int* keys, char (*names)[256], int lo, int hi);
void swap(int* keyA, int* keyB, char* nameA, char* nameB);
#endif

#endif
