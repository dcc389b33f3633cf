// Host stand-ins for work a device does off the application's CPU (the
// camera's image processor, a hardware video encoder) run their threads as
// batch work: they still get every idle moment of a core, but waking one
// never takes a core away from a thread already running, such as the render
// thread between its latch and its swap, whose timing is the preview's.
#ifndef KIVHOST_BACKGROUNDTHREAD_H
#define KIVHOST_BACKGROUNDTHREAD_H

#include <pthread.h>
#include <sched.h>

namespace kivhost {

// For the calling thread; threads it starts afterwards inherit it. Best
// effort: a refusal leaves the thread as it was.
inline void BackgroundThread_enter() {
    sched_param param{};
    param.sched_priority = 0;
    pthread_setschedparam(pthread_self(), SCHED_BATCH, &param);
}

}  // namespace kivhost

#endif
