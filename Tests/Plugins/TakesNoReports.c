/* No thread is to be had for the reports. */
#include <errno.h>
#include <pthread.h>

/* In the place of the system's, for this plug-in alone. */
__attribute__((visibility("hidden"))) int pthread_create(pthread_t* thread,
                                                         const pthread_attr_t* attributes,
                                                         void* (*run)(void*), void* context) {
    (void)thread;
    (void)attributes;
    (void)run;
    (void)context;
    return EAGAIN;
}
