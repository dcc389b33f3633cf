#include "vccore/vc_error.h"

#include "vccore/vc_log.h"

extern "C" const char* VCError_name(int code) {
    switch (code) {
        case VC_OK:
            return "VC_OK";
        case VC_ERROR_NULL_PARAM:
            return "VC_ERROR_NULL_PARAM";
        case VC_ERROR_INVALID_PARAM:
            return "VC_ERROR_INVALID_PARAM";
        case VC_ERROR_INVALID_SIZE:
            return "VC_ERROR_INVALID_SIZE";
        case VC_ERROR_ALLOC_FAILED:
            return "VC_ERROR_ALLOC_FAILED";
        case VC_ERROR_UNSUPPORTED:
            return "VC_ERROR_UNSUPPORTED";
        case VC_ERROR_INVALID_STATE:
            return "VC_ERROR_INVALID_STATE";
        case VC_ERROR_IO_FAILED:
            return "VC_ERROR_IO_FAILED";
        case VC_ERROR_CODEC_FAILED:
            return "VC_ERROR_CODEC_FAILED";
        case VC_ERROR_NOT_IMPLEMENTED:
            return "VC_ERROR_NOT_IMPLEMENTED";
        default:
            return "VC_ERROR_UNKNOWN";
    }
}

extern "C" int VCError_report(int code, const char* source, int line) {
    VF_LogMsg(VF_LOG_ERROR, "%s (%d): %s:%d", VCError_name(code), code, source, line);
    return code;
}
