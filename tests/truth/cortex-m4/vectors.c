/* The vector table of the truth runner on a Cortex-M4: the initial stack pointer, newlib's
 * start-up code as the reset handler, and a fault handler that ends the run with an exit status
 * the host sees (through semihosting) instead of hanging the emulator. */
#include <stdlib.h>

typedef void (*Handler)(void);
extern char __stack[];
void _start(void);

static void fault(void) {
  _Exit(99);
}

__attribute__((section(".vectors"), used)) static const Handler vectors[16] = {
    [0] = (Handler)__stack, [1] = _start, [2 ... 15] = fault};
