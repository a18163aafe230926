#ifndef BRAMBLESUPPORT_BRAMBLESUITES_H
#define BRAMBLESUPPORT_BRAMBLESUITES_H

/*
 * The plain-C side of the suite support library: how a plug-in acquires and
 * releases a suite (a table of plain functions) by name and version.
 *
 * A suite is published by the host with BrambleSupport::RegisterSuite
 * (BrambleSupport/BrambleSupport.h). A plug-in acquires it, calls through the
 * table, and releases it when done; each acquisition is balanced by one
 * release. Tables stay valid while acquired and until the suite support
 * library's last Shutdown. Every function may be called from any thread and
 * never throws.
 */

#include <stdint.h>

#ifdef __cplusplus
extern "C"
{
#endif

/* Statuses of the release call (signed 32-bit, negative for failure). */
#define BRAMBLE_SUITE_OK 0
/* A null or empty name, or a version below 1. */
#define BRAMBLE_SUITE_BAD_ARGUMENT ((int32_t)0xA01C0001u)
/* No such suite is registered, or it is not acquired. */
#define BRAMBLE_SUITE_NOT_ACQUIRED ((int32_t)0xA01C0002u)

    /* The function table of the suite registered under (inName, inVersion), with
     * one more acquisition counted; null when there is none or an argument is bad
     * (null or empty name, version below 1). */
    const void* BrambleSupport_AcquireSuite(const char* inName, int32_t inVersion);

    /* Gives back one acquisition of the suite (inName, inVersion). Answers
     * BRAMBLE_SUITE_OK, BRAMBLE_SUITE_BAD_ARGUMENT, or BRAMBLE_SUITE_NOT_ACQUIRED
     * when the suite is unknown or has no acquisition outstanding. */
    int32_t BrambleSupport_ReleaseSuite(const char* inName, int32_t inVersion);

    /* The same two functions as a table, for plug-ins that are handed one pointer
     * at load time instead of linking against the host. */
    typedef struct BrambleBasicSuite
    {
        const void* (*AcquireSuite)(const char* inName, int32_t inVersion);
        int32_t (*ReleaseSuite)(const char* inName, int32_t inVersion);
    } BrambleBasicSuite;

    /* The process-wide basic suite; never null. */
    const BrambleBasicSuite* BrambleSupport_GetBasicSuite(void);

#ifdef __cplusplus
}
#endif

#endif
