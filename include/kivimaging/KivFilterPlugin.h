// libkivimaging filter plug-in SDK.
//
// A downloadable filter is an effect built as its own shared library, without
// libkivimaging's sources: include this one header, implement KivFilterPlugin,
// and export Create and Destroy:
//
//   #include <kivimaging/KivFilterPlugin.h>
//   class MyLook : public KivFilterPlugin { ... };
//   KIV_FILTER_PLUGIN_EXPORT KivFilterPlugin* Create() { return new MyLook(); }
//   KIV_FILTER_PLUGIN_EXPORT void Destroy(KivFilterPlugin* plugin) { delete plugin; }
//
// Where the library lives and how it is named
//   An application selects the filter with the effect name
//   "<package>,<library file>", e.g. "com.example.duotone,libduotone.so".
//   libkivimaging then opens "<folder><package>.<library file>" from
//     /system/cameradata/preloadfilters/Lib/arm/  for the package
//                                                 "com.kiv.android.filter" and
//                                                 the few vendor libraries the
//                                                 library knows by name;
//     /data/DownFilters/Lib/                      for every other package.
//   Textures the plug-in ships go to the matching Tex/ folder
//   (/system/cameradata/preloadfilters/Tex/ or /data/DownFilters/Tex/); the
//   plug-in is told which one in GLInfo. On a Linux host both folders are
//   looked up under the directory named by the KIV_SYSROOT variable.
//
//   Names are checked before any file is opened. A package name is one or
//   more segments joined by single dots, each segment a letter followed by
//   letters, digits or '_'. A library file name is made of letters, digits,
//   '.', '_' and '-', does not start with '.' or '-', holds no "..", and ends
//   in ".so". "<package>.<library file>" is at most 255 bytes. The file must
//   be a regular file (or a symbolic link to one) inside its folder; anything
//   else is refused and logged.
//
// Binary contract
//   libkivimaging calls the object only through its virtual table, so the
//   order of the virtual functions below is fixed: never insert, remove or
//   reorder them. Type information is never used, so a plug-in may be built
//   without RTTI. Build with a compiler of the Itanium C++ ABI (GCC or Clang,
//   as the Android NDK does), where the virtual destructor takes the first two
//   slots:
//     1, 2  ~KivFilterPlugin()         not called: Destroy frees the object
//     3     getName()
//     4     getDescription()           not called by libkivimaging
//     5     getDrawFlag()
//     6     setGLInfo()
//     7     compileFragmentShader()
//     8     onDrawFrame()
//     9     process()
//     10    getCapabilities()
//     11    getSupportedFormats()
//     12    setOption(const char*, int)
//     13    setOption(const char*, const char*)
//     14    releaseGL()
//
// Threads
//   setGLInfo, compileFragmentShader, onDrawFrame and releaseGL run on the
//   thread that owns the GL context, with the context current. process runs on
//   the thread that asked for CPU processing. setOption may come from any
//   thread: store the value and use it at the next frame.
//
// Failures
//   A library that cannot be opened, lacks Create, or whose Create returns
//   null leaves the effect without a plug-in: it then draws pictures
//   unchanged and refuses CPU processing. A shader that does not compile
//   (negative result) or link is replaced by a pass-through. A library without
//   Destroy is never unloaded.
#ifndef KIVIMAGING_KIVFILTERPLUGIN_H
#define KIVIMAGING_KIVFILTERPLUGIN_H

// getCapabilities() bits.
enum : int {
    // process() works on CPU buffers.
    KIV_PLUGIN_CAP_CPU = 1,
    // compileFragmentShader()/onDrawFrame() draw with OpenGL ES 2.0.
    KIV_PLUGIN_CAP_GL = 2,
};

// getSupportedFormats() bits, and the `format` argument of process().
// Buffers are tightly packed, width*height pixels:
//   RGBA, BGRA  4 bytes a pixel, in that byte order;
//   NV21, NV12  (3*width*height + 1) / 2 bytes: width*height luma bytes, then
//               interleaved chroma at half resolution (V first for NV21,
//               U first for NV12), full range.
enum : int {
    KIV_PLUGIN_FORMAT_RGBA = 1,
    KIV_PLUGIN_FORMAT_BGRA = 2,
    KIV_PLUGIN_FORMAT_NV21 = 4,
    KIV_PLUGIN_FORMAT_NV12 = 8,
};

// Texture coordinates of the camera picture, as GLInfo::mCamera0GeometryType
// and the integer option "Camera0GeometryType" give them.
enum : int {
    KIV_PLUGIN_GEOMETRY_VFLIP = 0,
    KIV_PLUGIN_GEOMETRY_NORMAL = 1,
    KIV_PLUGIN_GEOMETRY_ROTATE_180 = 2,
    KIV_PLUGIN_GEOMETRY_HFLIP = 3,
};

// The GL set-up handed to setGLInfo(). The record is valid during the call;
// the two texts stay valid as long as the plug-in object lives.
struct GLInfo {
    // The folder of the plug-in's textures, ending in '/'.
    const char* mTextureDirectory;
    // The package part of the effect name.
    const char* mPackageName;
    // The GL program the plug-in's fragment shader is linked into. It is
    // linked after setGLInfo returns: look uniforms up in onDrawFrame.
    unsigned int mProgramId;
    // The texture unit the plug-in may use: glActiveTexture(GL_TEXTURE0 + n)
    // and set the sampler uniform to n. Units 0 and 1 carry the camera
    // pictures.
    int mTextureUnit;
    // The camera picture's size and two further extents (each the camera
    // width or height when the program has none), as the program knows them
    // when it is built: 0 when it does not yet (offline processing), so take
    // the size to draw from onDrawFrame.
    int mCameraWidth;
    int mCameraHeight;
    int mCameraWidth2;
    int mCameraHeight2;
    // One of the KIV_PLUGIN_GEOMETRY_* values.
    int mCamera0GeometryType;
};

class KivFilterPlugin {
public:
    virtual ~KivFilterPlugin() {}

    // The plug-in's name, for log lines. Must not be null.
    virtual const char* getName() = 0;
    // A one-line description for an application's effect picker.
    virtual const char* getDescription() = 0;

    // true: libkivimaging binds the program, the quad's attributes
    // ("a_position", "a_texcoord") and the camera sampler, calls onDrawFrame
    // for the plug-in's own uniforms and textures, then draws the quad.
    // false: onDrawFrame draws everything itself. Asked each time the program
    // is built.
    virtual bool getDrawFlag() = 0;

    // Called after compileFragmentShader, each time libkivimaging builds its
    // program (once per picture offline, once per effect switch live).
    virtual void setGLInfo(const GLInfo* info) = 0;

    // Called with 0. Compiles the complete fragment shader and returns its GL
    // shader name, or a negative value on failure. The shader object then
    // belongs to libkivimaging, which links it with its vertex shader:
    //   attribute highp vec4 a_position; attribute highp vec2 a_texcoord;
    //   varying highp vec2 v_texcoord;
    // The camera picture is "uniform samplerExternalOES texSampler" (needs
    // "#extension GL_OES_EGL_image_external : require").
    virtual int compileFragmentShader(int reserved) = 0;

    // Draws one frame into a viewport of width x height; upsideDown is the
    // preview's flip flag.
    virtual void onDrawFrame(int width, int height, bool upsideDown) = 0;

    // Processes `in` into `out` (same size and format, see the format bits).
    // Returns 0, or a negative value on failure.
    virtual int process(const unsigned char* in, unsigned char* out, int width, int height,
                        int format) = 0;

    // KIV_PLUGIN_CAP_* bits. Read once, right after Create.
    virtual int getCapabilities() = 0;
    // KIV_PLUGIN_FORMAT_* bits that process() accepts. Read once, right after
    // Create; pictures in other formats are refused before they reach it.
    virtual int getSupportedFormats() = 0;

    // Options. libkivimaging itself sends "Camera0GeometryType" (int) when the
    // camera's geometry changes and "parameter" (text, "name=value,...") when
    // the application sets the effect's parameter string.
    virtual void setOption(const char* name, int value) = 0;
    virtual void setOption(const char* name, const char* value) = 0;

    // The GL context is going away: hand back every texture the plug-in made,
    // as *textures (an array the plug-in owns, read before the next call into
    // the object) and *count. libkivimaging deletes them on the GL thread; the
    // plug-in forgets them and makes new ones when it next draws. Returns 0,
    // or non-zero on failure.
    virtual int releaseGL(unsigned int** textures, int* count) = 0;
};

// Exports Create/Destroy unmangled and visible, whatever the build's defaults.
#define KIV_FILTER_PLUGIN_EXPORT extern "C" __attribute__((visibility("default")))

// The two functions a filter library exports, as libkivimaging looks them up.
typedef KivFilterPlugin* (*KivFilterPluginCreate)();
typedef void (*KivFilterPluginDestroy)(KivFilterPlugin* plugin);

#endif
