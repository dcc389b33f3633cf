// Status codes of the library and the one function that reports them.
#ifndef VCCORE_VC_ERROR_H
#define VCCORE_VC_ERROR_H

#ifdef __cplusplus
extern "C" {
#endif

#define VC_OK 0
#define VC_ERROR_UNKNOWN (-1)
#define VC_ERROR_NULL_PARAM (-2)
#define VC_ERROR_INVALID_PARAM (-3)
#define VC_ERROR_INVALID_SIZE (-4)
#define VC_ERROR_ALLOC_FAILED (-5)
#define VC_ERROR_UNSUPPORTED (-6)
#define VC_ERROR_INVALID_STATE (-7)
#define VC_ERROR_IO_FAILED (-8)
#define VC_ERROR_CODEC_FAILED (-9)
// Deliberately outside the -1…-9 run.
#define VC_ERROR_NOT_IMPLEMENTED (-42)

// Symbolic name of a code ("VC_ERROR_NULL_PARAM"); "VC_ERROR_UNKNOWN" for codes
// that have none.
const char* VCError_name(int code);

// Logs "<name> (<code>): <source>:<line>" at error level and returns code.
// source is the file's path in the tree without extension ("vccore/src/vc_image").
int VCError_report(int code, const char* source, int line);

#ifdef __cplusplus
}
#endif

// In a source file: #define VC_SOURCE "vccore/src/vc_image", then
// `return VC_REPORT(VC_ERROR_NULL_PARAM);`
#define VC_REPORT(code) VCError_report((code), VC_SOURCE, __LINE__)

#endif
