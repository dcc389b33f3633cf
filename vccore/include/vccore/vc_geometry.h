// Scaling, cropping, rotating by right angles and pasting image records.
#ifndef VCCORE_VC_GEOMETRY_H
#define VCCORE_VC_GEOMETRY_H

#include "vccore/vc_image.h"

#ifdef __cplusplus
extern "C" {
#endif

int VCImage_scale(const VCImage* source, VCImage* destination);
int VCImage_crop(const VCImage* source, VCImage* destination, int x, int y);
int VCImage_rotate(VCImage* image, int angle);
int VCImage_drawImage(const VCImage* source, VCImage* destination, int x, int y);

#ifdef __cplusplus
}
#endif

#endif
