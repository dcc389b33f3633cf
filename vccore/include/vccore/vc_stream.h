// Pictures that never have to be whole in memory: a JPEG or PNG stream
// decoded into straight-alpha RGBA a band of rows at a time, and RGBA rows
// encoded into a JPEG or PNG stream as they come. The streams are byte for
// byte those of the whole-picture functions with the general codecs
// (VCImage_decodeFromJpeg into "RGBA", VCImage_encodeToJpeg of an "RGBA"
// image without the fast codec, VCPicture_encodePng).
#ifndef VCCORE_VC_STREAM_H
#define VCCORE_VC_STREAM_H

#include <stddef.h>

#include "vccore/vc_picture.h"

#ifdef __cplusplus
extern "C" {
#endif

// Whether the platform's fast JPEG codec is installed: the whole-picture
// functions then code JPEG through it, and only it can give their bytes.
int VCStream_fastJpegCodecInstalled(void);

typedef struct VCStreamReader VCStreamReader;
typedef struct VCStreamWriter VCStreamWriter;

// A reader over `length` bytes of JPEG or PNG data, which must outlive it;
// null for other data (VCPicture_lastFailure says why).
VCStreamReader* VCStreamReader_open(const unsigned char* bytes, size_t length);
// Copies up to `count` of a stream's next bytes to `to`: how many (0 at its
// end), or -1 when they cannot be read.
typedef long (*VCStreamSource)(void* user, unsigned char* to, size_t count);
// The same over bytes pulled from `source` as the decoding goes, so that the
// encoded stream is never whole in memory either (the source must outlive
// the reader). Bytes that end early are VC_DECODE_TRUNCATED, a source that
// fails VC_DECODE_READ_FAILED.
VCStreamReader* VCStreamReader_openSource(VCStreamSource source, void* user);
// 0 with the picture's size, or VC_ERROR_CODEC_FAILED (reason in VCPicture_lastFailure).
int VCStreamReader_readHeader(VCStreamReader* reader, int* width, int* height);
// Receives rows [firstRow, firstRow + rows) of the picture, width * 4 bytes
// apart, valid only during the call; a non-zero result stops the decoding
// and is returned by VCStreamReader_readBands.
typedef int (*VCStreamBand)(void* user, const unsigned char* rgba, int firstRow, int rows);
// After the header: decodes the picture `rows` rows at a time (fewer in the
// last band). 0, the band's own non-zero result, or VC_ERROR_CODEC_FAILED
// (reason in VCPicture_lastFailure).
int VCStreamReader_readBands(VCStreamReader* reader, int rows, VCStreamBand band, void* user);
// As VCStreamReader_readBands, but each band is decoded straight into the
// caller's memory where the reader can (else through a band of its own and a
// copy): place(user, firstRow, rows) says where row firstRow goes, the rows
// `pitch` bytes apart (at least width * 4); `band` follows once they are
// there (its rows are that memory). A null place stops the decoding: VC_ERROR_INVALID_STATE, the
// caller knowing why.
typedef unsigned char* (*VCStreamPlace)(void* user, int firstRow, int rows);
int VCStreamReader_readBandsInPlace(VCStreamReader* reader, int rows, size_t pitch,
                                    VCStreamPlace place, VCStreamBand band, void* user);
// Why the reader's last call failed (on whichever thread it ran);
// VC_DECODE_OK when it did not, or when a band stopped it.
VCDecodeFailure VCStreamReader_failure(const VCStreamReader* reader);
void VCStreamReader_close(VCStreamReader* reader);

// A JPEG (quality 1...100, else 85; 4:2:0) or straight-alpha PNG encoder of a
// width x height picture; null for a size no record can hold or no memory.
VCStreamWriter* VCStreamWriter_openJpeg(int width, int height, int quality);
VCStreamWriter* VCStreamWriter_openPng(int width, int height);
// Where a writer may hand its stream as it is made, instead of keeping it:
// `length` bytes, valid during the call; non-zero stops the encoder.
typedef int (*VCStreamSink)(void* user, const unsigned char* bytes, size_t length);
// Before the first row: the stream goes to `sink` from now on; the writer
// then ends with VCStreamWriter_end instead of VCStreamWriter_finish.
void VCStreamWriter_setSink(VCStreamWriter* writer, VCStreamSink sink, void* user);
// With a sink, once every row is written: the rest of the stream goes to it.
// 0 or VC_ERROR_CODEC_FAILED (the sink refused, too). The writer is closed.
int VCStreamWriter_end(VCStreamWriter* writer);

// The next `rows` rows of RGBA, `pitch` bytes apart. 0 or VC_ERROR_CODEC_FAILED
// (also for more rows than the picture has).
int VCStreamWriter_writeRows(VCStreamWriter* writer, const unsigned char* rgba, size_t pitch,
                             int rows);
// Once every row is written: the stream (malloc'ed, *length bytes), or null.
// The writer is closed either way.
unsigned char* VCStreamWriter_finish(VCStreamWriter* writer, size_t* length);
void VCStreamWriter_close(VCStreamWriter* writer);

#ifdef __cplusplus
}
#endif

#endif
