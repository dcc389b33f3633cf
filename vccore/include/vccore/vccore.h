// Everything a client of the image core needs.
#ifndef VCCORE_VCCORE_H
#define VCCORE_VCCORE_H

#include "vccore/vc_convert.h"
#include "vccore/vc_error.h"
#include "vccore/vc_file.h"
#include "vccore/vc_geometry.h"
#include "vccore/vc_image.h"
#include "vccore/vc_log.h"
#include "vccore/vc_options.h"

#endif
