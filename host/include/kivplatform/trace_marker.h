// The system trace marker. On a device this is the atrace marker; on a host it
// is the ftrace marker when writable, else the file named by KIV_TRACE_FILE.
// The image core reaches it through its VF_TraceMarker hook, which the host
// layer sets to this before main().
#ifndef KIVPLATFORM_TRACE_MARKER_H
#define KIVPLATFORM_TRACE_MARKER_H

#ifdef __cplusplus
extern "C" {
#endif

// File descriptor to write trace records to, or -1 when tracing is off.
// Resolved once per process.
int KivPlatform_traceMarkerFd(void);

#ifdef __cplusplus
}
#endif

#endif
