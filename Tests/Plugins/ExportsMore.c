/* A function that no host asks for. */
#include <vexa/abi.h>

VEXA_API int anotherFunction(void);

VEXA_API int anotherFunction(void) {
    return 1;
}
