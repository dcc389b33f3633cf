// One GL program object with its vertex and fragment shader, and an index of
// the attribute and uniform locations it is driven by (looked up once by name).
// All calls need the GL context current.
#ifndef CORE_EGL_EGLSHADER_H
#define CORE_EGL_EGLSHADER_H

#include <map>
#include <string>

#include <utils/RefBase.h>

class EglShader : public virtual android::RefBase {
public:
    // Both precisions draw with the same program; the argument is kept so that
    // callers can state what they need.
    enum SHADER_PRECISION {
        SHADER_PRECISION_MEDIUM = 0,
        SHADER_PRECISION_HIGH = 1,
    };

    // Kinds of index records.
    enum {
        INDEX_ATTRIBUTE = 101,
        INDEX_UNIFORM = 102,
    };
    // Type tags stored with a record (informational only).
    enum {
        INDEX_TYPE_TEXCOORD = 204,
        INDEX_TYPE_POSITION = 206,
        INDEX_TYPE_SAMPLER = 217,
    };

    struct NameIndex {
        int mKind;
        int mType;
        int mHandle;  // GL location, -1 when unknown
    };

    // The full-screen quad's vertex shader shared by every effect.
    static const char kVertexShader[];

    EglShader();
    virtual ~EglShader();

    // Creates the program and attaches the vertex shader. With link set, the
    // program is linked as well when a fragment shader is already attached.
    // 0, -1 when no program can be created, -5 when the vertex shader fails.
    virtual int initialize(bool link);
    // Detaches and deletes every shader, deletes the program, empties the index.
    virtual void release();

    // Compiled shader name, or 0 (logged) on failure.
    unsigned int loadShader(unsigned int type, const char* source) const;

    // Attach id in place of the current shader of that stage (the replaced
    // shader is deleted); with link set, link the program too.
    int bindVertexShader(unsigned int id, bool link);
    int bindFragmentShader(unsigned int id, bool link);
    // Links the program: 0, or -1 when it does not link.
    int compileShader();
    void unBindVertexShader();
    void unBindFragmentShader();

    int bindProgram(SHADER_PRECISION precision);
    int unbindProgram();

    // 1 when the record was made or refreshed, 0 without a program.
    int addNameIndexer(const char* name, int kind, int type);
    const NameIndex* getNameIndexer(const char* name) const;
    void clearIndexer();

    // Unknown names, records of the other kind and location -1 are ignored.
    void setUniformi(const char* name, int value);
    void setUniformf(const char* name, float value);
    void setUniformfv(const char* name, int components, int size, const float* value);
    void bindVertexAttrib(const char* name, int component, const void* value);
    void unBindVertexAttrib(const char* name);

    void dumpShaderCode(const char* code) const;

    unsigned int getProgramId() const { return mProgramId; }
    unsigned int getVertexId() const { return mVertexId; }
    unsigned int getFragmentId() const { return mFragmentId; }

    EglShader(const EglShader&) = delete;
    EglShader& operator=(const EglShader&) = delete;

private:
    const NameIndex* findIndex(const char* name, int kind) const;

    unsigned int mProgramId;
    unsigned int mVertexId;
    unsigned int mFragmentId;
    std::map<std::string, NameIndex> mNameIndex;
};

#endif
