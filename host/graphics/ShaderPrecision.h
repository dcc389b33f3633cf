// Shader precision on a host GL. llvmpipe (and Debian's newer Mesa) reports
// mediump float as 16-bit and runs it emulated, about twice as slow as highp.
// mediump is only a minimum precision, so where the GL's mediump is that
// narrow the host compiles every shader with highp in its place; the texts
// the library hands out stay as they are, and a device compiles them as
// they are.
#ifndef KIV_HOST_GRAPHICS_SHADERPRECISION_H
#define KIV_HOST_GRAPHICS_SHADERPRECISION_H

#include <string>

namespace android {

// `source` with every mediump and lowp qualifier (precision statements,
// declarations, samplers) written as highp; the text is built in *storage
// and returned, or `source` itself when it has none of them. Only whole
// words are taken, so identifiers that merely contain them stay.
const char* ShaderPrecision_highp(const char* source, std::string* storage);

// With a context current: whether shaders of `type` (GL_VERTEX_SHADER or
// GL_FRAGMENT_SHADER) are to be promoted, that is the GL's mediump float
// has fewer than 23 fraction bits and its highp has them. Asked once per
// type and process (one driver per process).
bool ShaderPrecision_promotes(unsigned int type);

}  // namespace android

#endif
