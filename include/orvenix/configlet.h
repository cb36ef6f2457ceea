/*
 * The configlet as its host sees it: eleven plain C functions over groups, fields and instances.
 *
 * The host walks its settings tree: IcfgBeginGroup opens a group, IcfgSetField sets a field of it,
 * IcfgEndGroup closes it under the same name. A pass begins with the group "Orvenix", which makes a
 * new job; the end of "Upgrade" checks the device and starts the job on a thread of its own, so it
 * is closed last.
 *
 *   IcfgInitialize();
 *   IcfgBeginGroup("Orvenix", 0, 0);
 *   IcfgBeginGroup("Upgrade", 0, 0);
 *   IcfgBeginGroup("HTTPServer", 0, 0);
 *   IcfgSetField("IPAddress", 0, "10.0.0.2");
 *   IcfgEndGroup("HTTPServer", 0, 0);
 *   ...
 *   result = IcfgEndGroup("Upgrade", 0, 0);
 *   IcfgEndGroup("Orvenix", 0, 0);
 *
 * All texts are 8-bit and zero-terminated; a null text counts as empty, and a text that is too long
 * for its field is cut. A null pointer for a result is passed over. All functions are called by
 * one thread of the host, one call at a time. None keeps a pointer that it was given, but for the
 * callback table. Plain C linkage and calling convention, undecorated names.
 */
#pragma once

#if defined(_MSC_VER) && _MSC_VER < 1600 /* a device's compiler may be older than <stdint.h> */
#include <stddef.h>
typedef __int32 int32_t;
typedef unsigned __int32 uint32_t;
#else
#include <stdint.h>
#endif

#include "orvenix/export.h"

/* Results of the functions, unless said otherwise. */
#define ICFG_OK 0x00000000U
#define ICFG_UNKNOWN_NAME 0x822B0003U    /* no such group or field */
#define ICFG_UPGRADE_RUNNING 0xC4111001U /* "Upgrade" begun while an upgrade is in progress */
#define ICFG_NO_SPACE 0xC4111002U        /* end of "Upgrade": too little storage */
#define ICFG_NO_POWER 0xC4111003U        /* end of "Upgrade": power requirement not met */
#define ICFG_TEST_FAILED 0xC4111005U     /* end of "Upgrade": a registry test failed */

#if defined(__cplusplus) && (!defined(_MSC_VER) || _MSC_VER >= 1900)
#define ICFG_NOEXCEPT noexcept
#else
#define ICFG_NOEXCEPT
#endif

#ifdef __cplusplus
extern "C" {
#endif

typedef struct IcfgCallbacks IcfgCallbacks;

/* What the host offers to the configlet. Only the fifth entry is used. */
struct IcfgCallbacks {
  void (*reserved[4])(void);

  /*
   * Receives one status document. Called by the host's own thread inside an Icfg function and by
   * the upgrade's threads. Inside it the host may call the functions below, one call at a time as
   * ever. May be null.
   *
   * context  what IcfgSetCallbacks was given
   * text     the document; valid during the call
   * length   its characters, counting the terminating zero
   * table    this table
   */
  int (*set_data)(uintptr_t context, const char* text, int32_t length, const IcfgCallbacks* table);
};

/* Returns 2, the version of this interface. */
ORVENIX_EXPORT uint32_t IcfgGetInterfaceVersion(void) ICFG_NOEXCEPT;

/* Writes the version of the settings' schema, 1.0. `unused` is not looked at, here and below. */
ORVENIX_EXPORT uint32_t IcfgGetSchemaVersion(uint32_t unused, uint32_t* major,
                                             uint32_t* minor) ICFG_NOEXCEPT;

/* Forgets the current group and writes the version files "Orvenix.ini" and "MCFTP.ini". */
ORVENIX_EXPORT uint32_t IcfgInitialize(void) ICFG_NOEXCEPT;

/*
 * Where status documents go from now on: to the table's fifth entry, or with a null table to the
 * client's message queue.
 *
 * context  the host's own value, passed back with every document
 * table    kept, not copied: it must outlive every upgrade
 */
ORVENIX_EXPORT uint32_t IcfgSetCallbacks(uintptr_t context,
                                         const IcfgCallbacks* table) ICFG_NOEXCEPT;

/*
 * Opens a group. The name counts whole and without regard to case.
 *
 * mode     of "Orvenix" only: a value other than 0 makes no new job
 * returns  ICFG_OK, ICFG_UNKNOWN_NAME or ICFG_UPGRADE_RUNNING
 */
ORVENIX_EXPORT uint32_t IcfgBeginGroup(const char* name, uint32_t unused,
                                       uint32_t mode) ICFG_NOEXCEPT;

/*
 * Sets a field. Any leading part of a field's name stands for it, without regard to case, and the
 * first field in the schema's order wins; "Value" and "ValueName" count whole.
 *
 * returns  ICFG_OK, also when the field has no meaning in the current group, or ICFG_UNKNOWN_NAME
 */
ORVENIX_EXPORT uint32_t IcfgSetField(const char* name, uint32_t unused,
                                     const char* value) ICFG_NOEXCEPT;

/*
 * Reads "Protocol Version", or any leading part of that name: the multicast client's version.
 *
 * text     receives the version and a terminating zero, 5 bytes
 * length   receives the length without that zero
 * returns  ICFG_OK, or ICFG_UNKNOWN_NAME with nothing written
 */
ORVENIX_EXPORT uint32_t IcfgGetField(const char* name, uint32_t unused1, uint32_t unused2,
                                     char* text, uint32_t* length) ICFG_NOEXCEPT;

/*
 * Closes a group. The end of "Upgrade" checks power and space and starts the job; when a check
 * fails it reports that to the client, which takes 3 seconds, and no upgrade is in progress any
 * more. Any other name, known or not, gives ICFG_OK.
 *
 * returns  ICFG_OK, ICFG_NO_SPACE, ICFG_NO_POWER or ICFG_TEST_FAILED
 */
ORVENIX_EXPORT uint32_t IcfgEndGroup(const char* name, uint32_t unused1,
                                     uint32_t unused2) ICFG_NOEXCEPT;

/* There are no named instances: writes an empty name. */
ORVENIX_EXPORT uint32_t IcfgGetFirstInstance(uint32_t unused, char* name) ICFG_NOEXCEPT;

/* Returns 1: there is never a further instance. */
ORVENIX_EXPORT uint32_t IcfgGetNextInstance(void) ICFG_NOEXCEPT;

/* Frees nothing; an upgrade that runs goes on. */
ORVENIX_EXPORT uint32_t IcfgUninitialize(void) ICFG_NOEXCEPT;

#ifdef __cplusplus
}
#endif
