/* A host program written in C against the installed library. */
#include <lumicor/lmc.h>
#include <stdio.h>

int main(void) {
    LmcPhotoMeta meta = {0, NULL};
    unsigned int status = LmcDisposePhotoMeta(&meta);
    printf("dispose: %u\n", status);
    return status == LMC_STATUS_OK ? 0 : 1;
}
