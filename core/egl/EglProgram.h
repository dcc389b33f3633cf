// Draws one frame with the current effect: owns a GL program (EglShader)
// built from the fixed quad vertex shader and the effect's fragment shader,
// the camera and viewport geometry, the texture-unit budget handed to
// effects, and a recycler for GL objects dropped by effects. When an effect
// fails to build or to draw, a pass-through shader takes over so that the
// output is never left undefined.
//
// GL work happens only in initialize(), onDrawFrame() and release(), on the
// thread that has the context current. setFilter and the geometry setters
// may be called from any thread; they take effect at the next frame.
#ifndef CORE_EGL_EGLPROGRAM_H
#define CORE_EGL_EGLPROGRAM_H

#include <utils/Mutex.h>
#include <utils/RefBase.h>

#include <string>

#include "core/egl/EglRecycler.h"
#include "core/egl/EglShader.h"

class KivFilter;

class EglProgram : public virtual android::RefBase {
public:
    // Texture coordinates of the camera input for the four strip vertices.
    // Stored as given: a value above 3 is legal and binds no coordinates.
    enum GeometryType : int {
        GEOMETRY_VFLIP = 0,
        GEOMETRY_NORMAL = 1,
        GEOMETRY_ROTATE_180 = 2,
        GEOMETRY_HFLIP = 3,
    };

    // The quad as a triangle strip: (-1,-1,0) (1,-1,0) (-1,1,0) (1,1,0).
    static const float kVertices[12];
    // Indexed by GeometryType.
    static const float kTexCoords[4][8];

    static const char kBaseFragmentCode[];
    static const char kBaseFragmentCode2[];
    static const char kDefaultFragmentShader[];
    static const char kDefaultFragmentShader2D[];

    EglProgram();
    virtual ~EglProgram();

    // cameraMode 20..29 means two camera inputs. With defaultOnly the program
    // draws a 2D texture through the pass-through shader and ignores effects.
    int initialize(int cameraMode, bool defaultOnly);
    void release();

    // The program never deletes an effect; the replaced one gets releaseGL().
    void setFilter(KivFilter* filter);

    int setCameraGeometry(int width, int height, int third, int fourth);
    int setPreviewGeometry(int width, int height, bool flip);
    void setCameraGeometryType(GeometryType type, int camera);
    GeometryType getCameraGeometryType(int camera = 0) const;

    const char* getBaseFragmentCode() const;
    // Compiles an effect's fragment code; complete=false wraps it in the base
    // template. Shader name, 0 on failure.
    unsigned int loadFragmentShader(const char* code, bool complete);
    // Attaches and links; 0 or the failing code.
    int bindFragmentShader(unsigned int id);

    void resetAvailableTextures();
    // Units 0 and 1 belong to texSampler and texSampler2; the first unit
    // handed out after a reset is 2. -5 when the budget is spent.
    int getNextAvailableTexture();

    unsigned int getProgramID() const;

    int onDrawFrame();
    // Draws the quad of the last frame again, with the uniforms and textures
    // its effect set for it and without the effect's per-frame hook: another
    // part of the same frame (under a scissor), so an effect that animates
    // from frame to frame does not move on. Only where the program draws the
    // quad (the draw flag); -7 otherwise.
    int redrawFrame();

    // One window of a picture larger than a texture, drawn into a
    // framebuffer of the window's size: the quad carries the whole picture's
    // texture coordinates of the window's corners (so effects see the
    // picture's own positions and steps), and every texture read maps them
    // into the part of the picture the source texture holds:
    // held = (whole * sampleMap.xy - sampleMap.zw) * sampleScale.
    struct Window {
        int width;
        int height;
        float texCoords[8];  // as kTexCoords, camera 0
        float sampleMap[4];
        float sampleScale[2];
    };
    // nullptr goes back to whole pictures. Turning windows on or off
    // rebuilds the effect's shaders at the next onDrawFrame().
    void setWindow(const Window* window);
    // nullptr while drawing whole pictures.
    const Window* getWindow() const { return mWindowOn ? &mWindow : nullptr; }
    // A fragment shader's text as it must be compiled now: as given, or with
    // the window's read mapping in front. Uses *storage when it changes it.
    const char* windowedFragmentText(const char* text, std::string* storage) const;
    // On `programId`, in use: the window's read mapping (nothing without one).
    void setWindowUniform(unsigned int programId) const;
    // The quad's texture coordinates for camera 0: the window's, or those of
    // the geometry type (nullptr for a type that binds none).
    const float* quadTexCoords() const;

    // For effects: whether the program binds the quad and draws itself.
    void setDrawFlag(bool draw) { mDrawFlag = draw; }
    bool getDrawFlag() const { return mDrawFlag; }

    int getCameraMode() const { return mCameraMode; }
    int getCameraWidth() const { return mCameraWidth; }
    int getCameraHeight() const { return mCameraHeight; }
    int getCameraWidth2() const { return mCameraWidth2; }
    int getCameraHeight2() const { return mCameraHeight2; }
    int getPreviewWidth() const { return mPreviewWidth; }
    int getPreviewHeight() const { return mPreviewHeight; }
    bool getPreviewFlip() const { return mPreviewFlip; }
    int getMaxAvailableTextures() const { return mMaxAvailableTextures; }
    KivFilter* getFilter() const { return mFilter; }
    const android::sp<EglShader>& getShader() const { return mShader; }
    const android::sp<EglRecycler>& getRecycler() const { return mRecycler; }

    EglProgram(const EglProgram&) = delete;
    EglProgram& operator=(const EglProgram&) = delete;

private:
    int initialize_l(int cameraMode, bool defaultOnly);
    // Uses the program and binds the quad's vertices and texture coordinates.
    void bindQuad_l();
    void viewport_l();
    void release_l();
    int loadEffectShader();
    int loadDefaultShader();
    int initShaderIndexer();
    bool isDualCamera() const { return mCameraMode / 10 == 2; }

    android::sp<EglRecycler> mRecycler;
    android::sp<EglShader> mShader;
    int mNextTexture;
    int mMaxAvailableTextures;
    KivFilter* mFilter;
    int mCameraMode;
    int mCameraWidth;
    int mCameraHeight;
    int mCameraWidth2;
    int mCameraHeight2;
    GeometryType mCamera0GeometryType;
    GeometryType mCamera1GeometryType;
    int mPreviewWidth;
    int mPreviewHeight;
    bool mDefaultOnly;
    bool mPreviewFlip;
    bool mReloadNeeded;
    bool mNameIndexReady;
    bool mDrawFlag;
    bool mWindowOn = false;
    Window mWindow = {};
    android::Mutex mLock;
};

#endif
