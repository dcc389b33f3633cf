// One picture through one effect a band of rows at a time: decoded, drawn
// and encoded on three threads at once, so that memory stays a few bands
// whatever the picture's size and every core has work.
//
// The source and the target are picture-sized shared pictures (EglNativeSeam)
// of which only the rows in flight hold memory. Every band is drawn with the
// whole picture's geometry and a scissor around the band, so each pixel is
// computed exactly as one draw of the whole picture computes it (GL
// interpolates from the framebuffer's origin: a band drawn as a picture of
// its own would round differently). The source keeps the rows a band reads
// beyond its own (the effect's reach) until every band that reads them is
// drawn.
//
//   decoder thread:  reader -> rows of the source (through NV21 and back when
//                    asked, as a picture decoded to NV21 reaches the GPU)
//                    (or, for a picture already decoding, its kept rows
//                    and then its decoder's, KivDecodeAhead)
//   GL thread:       per band, once its source rows are there: draw, finish
//   encoder thread:  rows of the target -> writer, then their memory goes
//
// Where the pictures can, they keep a ring of a few bands' memory instead
// (EglSharedPicture::useBandRing): a band takes the memory of one no stage
// uses any more, so that after the first bands nothing is allocated, zeroed
// or given back.
//
// A picture wider or taller than a texture keeps its rows in CPU memory
// (KivRowStore) and each band is drawn in column tiles: the tile and the rows
// and columns it reads around it are copied into a tile-sized source, drawn
// as a window of the whole picture (EglProgram::Window: the picture's own
// coordinates and steps) into a tile-sized target, and copied back.
#ifndef KIV_CORE_KIVBANDPIPELINE_H
#define KIV_CORE_KIVBANDPIPELINE_H

#include <GLES2/gl2.h>
#include <limits.h>

#include <condition_variable>
#include <mutex>
#include <vector>

#include "core/egl/EglNativeSeam.h"
#include "vccore/vc_stream.h"

class EglProgram;
class KivDecodeAhead;

class KivBandPipeline {
public:
    struct Picture {
        int width;
        int height;
        // Rows beyond a band's own that its pixels read, above and below;
        // `height` for effects that may read anywhere.
        int haloRows;
        // Source rows cross RGBA -> NV21 -> RGBA (even sizes only).
        bool throughNv21;
        // Rows per band; 0 for bandRows(width).
        int bandRows;
    };

    // For pictures drawn in tiles: the GL side of one tile.
    struct Tiles {
        // Bound as the current external texture: a tile, its reach around
        // it and, past the picture's edges, copies of the edge pixels.
        EglSharedPicture* source;
        // The framebuffer's colour buffer, a band's rows high.
        EglSharedPicture* target;
        int sourceWidth;
        int sourceRows;
        // Columns a pixel reads to either side.
        int haloColumns;
    };

    // `program` draws the effect from the source (bound as the current
    // external texture) into the bound framebuffer, whose colour buffer is
    // `target`; with `tiles`, source and target are CPU rows and the tiles'
    // pictures are what GL draws from and into.
    KivBandPipeline(EglProgram& program, EglSharedPicture& source, EglSharedPicture& target,
                    const Picture& picture, const Tiles* tiles = nullptr);

    // On the thread whose context holds the GL objects. 0; or
    // VC_ERROR_CODEC_FAILED when the picture did not decode (the reader says
    // why) or did not encode; VC_ERROR_UNKNOWN when a draw failed;
    // VC_ERROR_ALLOC_FAILED without memory for a band.
    int run(VCStreamReader* reader, VCStreamWriter* writer);
    // The same with a picture already decoding (in RGBA: not through NV21),
    // whose rows it takes over; `ahead` says why a picture did not decode.
    int run(KivDecodeAhead* ahead, VCStreamWriter* writer);

    // Rows per drawn band for a picture `width` pixels wide: about a
    // megabyte of RGBA (each picture keeps a few bands on each side of GL),
    // in whole llvmpipe tiles (64 rows).
    static int bandRows(int width);
    // For tests: bands of `rows` rows (a multiple of 64) whatever the width;
    // 0 goes back to bandRows().
    static void setBandRowsForTesting(int rows);

    KivBandPipeline(const KivBandPipeline&) = delete;
    KivBandPipeline& operator=(const KivBandPipeline&) = delete;

private:
    static int onDecoded(void* self, const unsigned char* rgba, int first, int rows);
    static unsigned char* onPlace(void* self, int first, int rows);
    static int onPlaced(void* self, const unsigned char* rgba, int first, int rows);
    // Waits until rows [first, first + rows) of the source may be written
    // (giving them their band's memory); 0 or the failure.
    int makeRoom(int first, int rows);
    void rowsStored(int end);
    // Rows decoded to RGBA, through NV21 into the source.
    int storeRows(const unsigned char* rgba, int first, int rows);
    void decode(VCStreamReader* reader, KivDecodeAhead* ahead);
    int start(VCStreamReader* reader, KivDecodeAhead* ahead, VCStreamWriter* writer);
    void encode(VCStreamWriter* writer);
    int draw();
    // Draws rows [y0, y1) tile by tile; 0 or the failure.
    int drawTiles(int y0, int y1, bool first);
    // Records the first failure and wakes every stage.
    void fail(int status);
    // Under the lock, once a mark has moved: wakes the stages whose marks
    // are reached, and only those.
    void wakeReady();

    EglProgram& mProgram;
    EglSharedPicture& mSource;
    EglSharedPicture& mTarget;
    const Picture mPicture;
    const int mBandRows;
    const Tiles mTiles;  // all null without tiles

    // The decoder thread's band scratch (NV21, and RGBA where the source's
    // rows are padded).
    std::vector<unsigned char> mNv21;
    std::vector<unsigned char> mRgba;

    // Bands of memory the source and target keep in turns; 0 without a ring.
    int mSourceSlots = 0;
    int mTargetSlots = 0;

    std::mutex mLock;
    int mDecoded = 0;  // source rows written
    int mDrawn = 0;    // target rows finished
    int mEncoded = 0;  // target rows encoded
    int mStatus = 0;   // the first failure
    // Each stage sleeps on a condition of its own with the marks it waits
    // for, and is woken once they are reached: a wake-up costs a core's
    // wake-up (on a virtual machine's host, at times a millisecond), and one
    // condition for all woke every stage at every 16 decoded rows.
    std::condition_variable mDecoderWake, mDrawWake, mEncoderWake;
    int mDecoderNeedsDrawn = INT_MAX;
    int mEncoderNeedsDrawn = INT_MAX;
    int mDrawNeedsDecoded = INT_MAX;
    int mDrawNeedsEncoded = INT_MAX;
};

// Picture-sized RGBA rows in CPU memory of which only the rows written and
// not yet discarded hold pages: the source and target of tiled pictures.
// With a ring, a band's pages move on to the band that takes its slot, so a
// large picture is not faulted in and zeroed band after band.
class KivRowStore : public EglSharedPicture {
public:
    // Reserves the address space; false when it cannot.
    bool make(int width, int height);
    ~KivRowStore() override;
    GLuint texture() const override { return 0; }
    unsigned char* row(int y) const override { return mRows + (size_t)y * mPitch; }
    size_t pitch() const override { return mPitch; }
    void discardRowsBelow(int y) override;
    // Bands of whole pages only.
    bool useBandRing(int bandRows, int slots) override;
    bool takeBand(int band) override;

private:
    unsigned char* mRows = nullptr;
    size_t mPitch = 0;
    size_t mSize = 0;  // whole pages
    size_t mDiscarded = 0;
    size_t mBandBytes = 0;  // with a ring
    int mSlots = 0;
};

#endif
