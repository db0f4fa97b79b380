/* Start-up of the firmwares run on emulated Cortex-M boards (the truth table, the instruction
 * counts): the vector table, a reset handler and a fault handler, with newlib's semihosting
 * (rdimon) for output and exit status.
 *
 * newlib's own start-up asks the emulator where the heap and stack go, and on the MPS3-AN547 the
 * answer is the 512 KiB ITCM, below where the firmware is loaded, so every malloc would fail. So
 * the linker script places the stack at the top of the firmware's RAM, and newlib's sbrk gives
 * out the RAM between the end of the image and the stack pointer. */
#include <stdint.h>
#include <stdlib.h>

typedef void (*Handler)(void);
extern char __stack[], __bss_start__[], __bss_end__[];
void initialise_monitor_handles(void);
void __libc_init_array(void);
int main(int argc, char **argv);
void mcu_reset(void);

/* __libc_init_array calls these; the firmwares have nothing to run there. */
void _init(void) {}
void _fini(void) {}

void mcu_reset(void) {
  /* Full access to the coprocessors 10 and 11: the FPU and, on Armv8.1-M, the vector unit. A core
   * without them ignores the write. */
  *(volatile uint32_t *)0xE000ED88 |= 0xFu << 20;
  __asm__ volatile("dsb\n\tisb" ::: "memory");
  for (char *p = __bss_start__; p < __bss_end__; ++p) *p = 0;
  initialise_monitor_handles();
  __libc_init_array();
  /* No command line: the firmwares run as if started with their name alone. */
  static char name[] = "firmware";
  static char *argv[] = {name, 0};
  exit(main(1, argv));
}

/* Ends the run with a status the host sees instead of hanging the emulator. */
static void fault(void) {
  _Exit(99);
}

__attribute__((section(".vectors"), used)) static const Handler vectors[16] = {
    [0] = (Handler)__stack, [1] = mcu_reset, [2 ... 15] = fault};
