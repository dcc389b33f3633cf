// The host's GPU is llvmpipe, and its rasteriser threads ("llvmpipe-N", one
// per core, shared by every context of the display) are the GPU's cores.
// Left to the scheduler, a rasteriser thread woken by another is often put on
// the waker's core while the other core idles, and stays there: a 720p frame
// then rasterises on one core in twice its time (about one frame in ten on
// this two-core machine, the main cause of the live preview's late frames).
// Each thread is kept on a core of its own, as a device's GPU has cores of
// its own. The rasteriser hands out tiles to whichever thread asks next, so a
// core busy with something else delays no more than the tile on it.
// KIV_HOST_RASTERISER_AFFINITY=0 leaves the threads to the scheduler (to
// measure the difference).
#ifndef HOST_GRAPHICS_RASTERISERAFFINITY_H
#define HOST_GRAPHICS_RASTERISERAFFINITY_H

#include <EGL/egl.h>

namespace android {

// With Mesa's software driver behind `display`: puts rasteriser thread N of
// this process on the Nth core this thread may run on (N modulo their
// count), after waiting up to 50 ms for as many threads as llvmpipe starts
// to have named themselves. Returns how many threads it placed; 0 when
// turned off, with one core, or with another driver.
int RasteriserAffinity_apply(EGLDisplay display);

}  // namespace android

#endif
