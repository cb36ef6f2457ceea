/*
 * A device on the desk of whoever writes a host or a client: the calling thread becomes a program
 * of a simulated device, on this machine's clock and sockets. In C, for programs that want no more
 * of the simulator than a place to run in.
 *
 *   char reason[200];
 *   CesimDevice* device = CesimBegin("my-device", reason, sizeof reason);
 *   if (device == NULL) return fprintf(stderr, "%s\n", reason), 1;
 *   IcfgInitialize();
 *   ...
 *   CesimEnd(device);
 */
#pragma once

#include <stddef.h>

#ifdef __cplusplus
#define CESIM_NOEXCEPT noexcept
extern "C" {
#else
#define CESIM_NOEXCEPT
#endif

typedef struct CesimDevice CesimDevice;

/*
 * Starts the device that lives in a folder; made when it is not there. Its files are in `storage/`
 * below it, and its profile, when there is one, in `device.profile`. The calling thread is a
 * program of this device until CesimEnd; threads that it starts otherwise than by CreateThread are
 * not.
 *
 * folder  of the host
 * reason  receives why there is no device; may be null
 * size    of `reason`, bytes; what does not fit is cut
 * returns the device, or null
 */
CesimDevice* CesimBegin(const char* folder, char* reason, size_t size) CESIM_NOEXCEPT;

/*
 * Switches the device off: its threads end at their next blocking call, and its registry is saved.
 * Called by the thread that began it. A null device is passed over.
 */
void CesimEnd(CesimDevice* device) CESIM_NOEXCEPT;

#ifdef __cplusplus
}
#endif
