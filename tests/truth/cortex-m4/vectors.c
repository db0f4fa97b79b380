/* The vector table of the truth runner on a Cortex-M4: the initial stack pointer, newlib's
 * start-up code as the reset handler, and a fault handler that ends the run with an exit status
 * the host sees (through semihosting) instead of hanging the emulator. */
#include <stdlib.h>

extern char __stack[];
void _start(void);

static void fault(void) { _Exit(99); }

__attribute__((section(".vectors"), used)) static void (*const vectors[16])(void) = {
    (void (*)(void))__stack, _start, fault, fault, fault, fault, fault, 0, 0, 0, 0, fault, fault,
    0, fault, fault};
