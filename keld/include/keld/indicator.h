/* The front panel: LED and beeper. Threads: any. */
#ifndef KELD_INDICATOR_H
#define KELD_INDICATOR_H

#ifdef __cplusplus
extern "C" {
#endif

/* Codes of the LED. */
enum {
    KELD_LED_BUSY = 64,        /* model without a copy button */
    KELD_LED_OFF = 65,         /* model without a copy button */
    KELD_LED_BUTTON_BUSY = 66, /* model with a copy button */
    KELD_LED_BUTTON_IDLE = 10,
    KELD_LED_BUTTON_OFF = 12
};
/* Sets the LED pattern. Returns 0, negative on failure. A box without the LED succeeds. */
int KLIBScemdNotify(int code);

/* Commands of the hardware; a beep is the first and then the second. */
enum { KELD_HW_BEEP = 0x5302, KELD_HW_BEEP_APPLY = 0x5301 };
/* Issues a hardware command. Returns 0, negative on failure. A box without the part succeeds. */
int KELDHWExternalControl(int command, int arg1, int arg2);

#ifdef __cplusplus
}
#endif
#endif
