/* A plug-in's view of the suite support library, compiled as C: proves that
 * the plain-C header stands alone and that its calls link from C code. */

#include "BrambleSupport/BrambleSuites.h"

#include <stddef.h>

/* Acquires (inName, inVersion) through the basic suite table, reads the first
 * function of the suite's table (a function taking and returning int), calls
 * it with inArgument and releases the suite. Answers the call's result, or -1
 * when the suite is not there or the release fails. */
int CallFirstSuiteFunctionFromC(const char* inName, int32_t inVersion, int inArgument)
{
    typedef int (*SuiteFunction)(int);
    typedef struct
    {
        SuiteFunction mFirst;
    } SuiteTable;

    const BrambleBasicSuite* basic = BrambleSupport_GetBasicSuite();
    const SuiteTable* table = (const SuiteTable*)basic->AcquireSuite(inName, inVersion);
    if (table == NULL)
        return -1;
    int result = table->mFirst(inArgument);
    if (basic->ReleaseSuite(inName, inVersion) != BRAMBLE_SUITE_OK)
        return -1;
    return result;
}
