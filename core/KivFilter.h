// Base class of every effect. Processors drive all effects through this one
// virtual interface; the order of the virtual operations below is part of the
// binary interface shared with separately built filter libraries, so new
// operations go into subclasses, never in between.
#ifndef KIV_CORE_KIVFILTER_H
#define KIV_CORE_KIVFILTER_H

#include "vccore/vc_image.h"
#include "vccore/vc_options.h"

class EglProgram;
class EglRecycler;

// Receives event texts from effects that report them (picture-in-picture).
typedef void (*KivFilterCallback)(const char* message, void* context);

class KivFilter {
public:
    // Integer value ids understood by setValue/getValue.
    enum {
        VALUE_INPUT_WIDTH = 102,
        VALUE_INPUT_HEIGHT = 103,
        VALUE_INPUT_FORMAT = 104,
        VALUE_FILTER_TYPE = 105,
        VALUE_FLAG = 111,
    };

    KivFilter();
    virtual ~KivFilter();

    virtual int setValue(int id, int value);
    virtual int getValue(int id, int defaultValue);
    virtual int setInputImage(const unsigned char* data, int width, int height, int format,
                              int extra);
    virtual int setOutputImage(unsigned char* data, int width, int height, int format, int extra);
    // CPU processing of the input into the output image.
    virtual int doEffect() = 0;
    virtual int getFilterType() const = 0;
    virtual int init();
    virtual int release();
    virtual int loadPartialFragmentShader(EglProgram& program, const char* header,
                                          unsigned int& shaderId);
    virtual int loadExtFragmentShader(EglProgram& program);
    virtual const char* getPkgAndFileName();
    virtual int onDrawFrame(EglProgram& program);
    virtual void onInputImageSet();
    // GL names go to the recycler: the caller may not hold the GL context.
    virtual int releaseGL(EglRecycler& recycler);
    virtual bool isGLPreviewSupported();
    virtual bool isGLPictureSupported();
    virtual int getOptionsCount() const;
    virtual const char* const* listOptionNames() const;
    virtual const VCOption_t* const* listOptions() const;
    virtual const VCOption_t* getOptionDesc(int id) const;
    virtual const VCOption_t* getOptionDesc(const char* name) const;
    virtual int setOption(int id, int value);
    virtual int setOption(int id, float value);
    virtual int setOption(int id, const char* value);
    virtual int setOption(const char* name, int value);
    virtual int setOption(const char* name, float value);
    virtual int setOption(const char* name, const char* value);
    virtual void kivImagingSetCallback(KivFilterCallback callback, void* context);
    virtual VCOptionValue_t getOption(const char* name) const;
    virtual VCOptionValue_t getOption(int id) const;
    virtual bool checkSupportFormat(int format) const;
    virtual bool needsWorkImage() const;
    virtual void onWorkImageChanged();
    virtual void onInputFormatChanged();
    virtual bool supportsValueFlag() const;

    // Logs the request and forwards to KivFilterFactory::create; null for an
    // unknown id. arg is only read by the downloadable filter (id 2000).
    static KivFilter* create(int id, void* arg);

    KivFilter(const KivFilter&) = delete;
    KivFilter& operator=(const KivFilter&) = delete;

protected:
    VCImage* mWorkImage;
    VCImage* mInputImage;
    VCImage* mOutputImage;
    bool mValueFlag;
};

#endif
