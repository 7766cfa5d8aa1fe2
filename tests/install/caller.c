/* A C caller of the installed library, built with nothing but what
 * pkg-config or the CMake package gives it.  It calls only operations that
 * read their arguments, so it may run on the host as well as in the
 * sandbox: nothing here touches a file. */
#include <stdio.h>
#include <string.h>

#include <xavoprinter.h>

int main(void) {
    char szId[] = "MFG:ACME;MDL:Model 100;CMD:PCL;";
    char szModel[32];
    ORLICSzList *pList = ORLICSzListAlloc(256);

    if (pList == NULL) return 1;
    ORLICSzListFree(pList);
    if (XAVOPrinterConfStringIdGetModel(szId, szModel, (int32_t)sizeof szModel) != 0 ||
        strcmp(szModel, "Model 100") != 0) {
        fprintf(stderr, "caller: model lookup failed\n");
        return 1;
    }
    if (XAVOPrinterConfSetup(NULL, 0) != -1 || ORLICErrGet() != ERR_BAD_PARAMETERS) {
        fprintf(stderr, "caller: bad argument not reported\n");
        return 1;
    }
    printf("caller: %s\n", szModel);
    return 0;
}
