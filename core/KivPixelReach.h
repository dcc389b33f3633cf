// Which input pixels one output pixel of an effect depends on: what an engine
// that runs a picture band by band must keep of the input around each band.
#ifndef KIV_CORE_KIVPIXELREACH_H
#define KIV_CORE_KIVPIXELREACH_H

class KivFilter;

struct KivPixelReach {
    enum Kind {
        // The same input pixel (and the pixel's position in the picture).
        SAME_PIXEL = 0,
        // Input rows up to haloRows above and below the output row, and
        // columns up to haloColumns to either side.
        NEIGHBOURS = 1,
        // Anywhere in the picture.
        WHOLE_PICTURE = 2,
    };
    Kind kind;
    int haloRows;
    int haloColumns = 0;
};

// Effects that know their reach say so by also deriving from this.
class KivPixelReachSource {
public:
    // For a width x height input drawn at its own size.
    virtual KivPixelReach pixelReach(int width, int height) const = 0;

protected:
    ~KivPixelReachSource() = default;
};

// An effect's reach; WHOLE_PICTURE for null and for effects that do not say
// (downloadable filters, for one).
KivPixelReach KivFilter_pixelReach(const KivFilter* filter, int width, int height);

#endif
