/* Reads a VMAP document with an installed libkaVMAPParser, prints how many ad breaks it has and
 * the Error pings its failed wrapper chains owe (none when every chain resolved).
 * Usage: consumer DOCUMENT [LIBRARY [MODULES_DIR]]; the defaults come from the CMake package.
 * Built with KA_LINKED, it takes the table from the linked library (LIBRARY is then ignored). */
#include <dlfcn.h>
#include <kaVMAPParser.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#ifndef KA_MODULES_DIR
#define KA_MODULES_DIR NULL
#endif

static char* read_document(const char* path, long* size) {
    FILE* f = fopen(path, "rb");
    char* text = NULL;
    if (f != NULL && fseek(f, 0, SEEK_END) == 0 && (*size = ftell(f)) > 0 &&
        fseek(f, 0, SEEK_SET) == 0 && (text = malloc((size_t)*size)) != NULL &&
        fread(text, 1, (size_t)*size, f) != (size_t)*size) {
        free(text);
        text = NULL;
    }
    if (f != NULL) fclose(f);
    return text;
}

/* Each Error URL of each failed chain, its macros filled: what a player would ping. */
static void print_error_pings(KaGetVMAPParserExtAPIFn getExt, void* handle) {
    VMAPParserExtAPI ext = {0};
    ext.size = sizeof ext;
    KaChainOutcome* outcome = NULL;
    if (getExt == NULL || getExt(&ext) != 0 || ext.GetChainOutcomes(handle, &outcome) != 0) return;
    for (; outcome != NULL; outcome = outcome->next) {
        if (outcome->vastError == KA_VAST_ERROR_NONE) continue;
        KaMacroValues values = KA_MACRO_VALUES_INIT;
        values.errorCode = (int32_t)outcome->vastError;
        values.appBundle = "com.example.consumer";
        for (uint32_t i = 0; i < outcome->errorUrlCount; ++i) {
            char url[2048];
            if (ext.ExpandMacros(outcome->errorUrls[i], &values, url, sizeof url, NULL) == 0)
                printf("error ping: %s\n", url);
        }
    }
}

int main(int argc, char** argv) {
    /* Open keeps the folder by pointer until Close, and it must end with "/". */
    static char modules[4096];
    const char* dir = argc > 3 ? argv[3] : KA_MODULES_DIR;
    if (argc < 2 || argc > 4 || dir == NULL || *dir == '\0' || strlen(dir) + 1 >= sizeof modules) {
        fprintf(stderr, "usage: consumer DOCUMENT [LIBRARY [MODULES_DIR]]\n");
        return 2;
    }
    snprintf(modules, sizeof modules, "%s%s", dir, dir[strlen(dir) - 1] == '/' ? "" : "/");
    long size = 0;
    char* document = read_document(argv[1], &size);
    if (document == NULL) {
        fprintf(stderr, "consumer: cannot read %s\n", argv[1]);
        return 1;
    }
#ifdef KA_LINKED
    KaGetVMAPParserAPIFn getApi = kaGetVMAPParserAPI;
    KaGetVMAPParserExtAPIFn getExt = kaGetVMAPParserExtAPI;
#else
    void* lib = dlopen(argc > 2 ? argv[2] : KA_LIBRARY_PATH, RTLD_NOW | RTLD_LOCAL);
    KaGetVMAPParserAPIFn getApi =
        lib ? (KaGetVMAPParserAPIFn)dlsym(lib, "kaGetVMAPParserAPI") : NULL;
    if (getApi == NULL) {
        fprintf(stderr, "consumer: %s\n", dlerror());
        return 1;
    }
    KaGetVMAPParserExtAPIFn getExt = (KaGetVMAPParserExtAPIFn)dlsym(lib, "kaGetVMAPParserExtAPI");
#endif
    VMAPParserAPI api;
    void* handle = NULL;
    AdInfo* info = NULL;
    uint32_t rc = getApi(&api);
    if (rc == 0) rc = api.Open(&handle, modules);
    if (rc == 0) rc = api.Process(handle, document, (uint32_t)size);
    if (rc == 0) rc = api.GetAdInfo(handle, &info);
    if (rc == 0 && info != NULL) {
        printf("%s: %u ad breaks\n", argv[1], info->adBreakCount);
        print_error_pings(getExt, handle);
    } else
        fprintf(stderr, "consumer: failed with 0x%08x\n", rc);
    if (handle != NULL && api.Close(handle) != 0 && rc == 0) rc = 1;
    free(document);
    return rc == 0 && info != NULL ? 0 : 1;
}
