/* Calls what nobody has. */
#include <vexa/abi.h>

void vexa_function_of_another_release(void);

VEXA_API void callIt(void);

VEXA_API void callIt(void) {
    vexa_function_of_another_release();
}
