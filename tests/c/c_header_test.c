/* The public header compiled as C99, and the library called through it: a
 * plain C caller of the appliance must build and link against it as is. */
#include <stdio.h>
#include <string.h>

#include "xavoprinter.h"

static int failures;

#define EXPECT(cond)                                                   \
    do {                                                               \
        if (!(cond)) {                                                 \
            fprintf(stderr, "%s:%d: expected %s\n", __FILE__, __LINE__, #cond); \
            failures++;                                                \
        }                                                              \
    } while (0)

int main(void) {
    char szId[] = "MFG:ACME;MDL:Model 100;CMD:PCL,PJL;";
    char szBuf[64];
    UsbPrinterConf conf;
    NetPrinterInfo info;

    EXPECT(XAVOPrinterConfStringIdGetModel(szId, szBuf, (int32_t)sizeof szBuf) == 0);
    EXPECT(strcmp(szBuf, "Model 100") == 0);
    EXPECT(XAVOPrinterConfStringIdGetCmd(szId, szBuf, (int32_t)sizeof szBuf) == 0);
    EXPECT(strcmp(szBuf, "PCL,PJL") == 0);

    /* Argument checks answer through the platform's last error. */
    EXPECT(XAVOPrinterConfSetup(NULL, 0) == -1);
    EXPECT(ORLICErrGet() == ERR_BAD_PARAMETERS);
    EXPECT(XAVOPrinterModelDetect(NULL) == -1);
    EXPECT(XAVOPrinterNetInfoGetByIP(NULL, &info) == -1);

    memset(&conf, 0, sizeof conf);
    EXPECT(sizeof conf == 2208);
    EXPECT(XAVOCupsGetPPD(NULL) == NULL);

    if (failures == 0) printf("1 passed, 0 failed\n");
    return failures == 0 ? 0 : 1;
}
