/* A host of its own: it defines every module and platform function the library
 * imports, links nothing but the library, and binds one document. */
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "anno/anno.h"

struct DADocument { int unused; };
struct DARetrieved { void *slots[152]; int locked; };
struct CHChunker { int unused; };

static struct DADocument doc;
static struct DARetrieved retrieved;
static struct CHChunker chunker;
static int heapBlocks;
static int entryCalls;

uint32_t DAGetAnno(DAHandle d, void **instance) { (void)d; *instance = retrieved.slots[151]; return 0; }
uint32_t DARetrieveDocHandle(DAHandle d, DARetrievedDoc *r) { (void)d; *r = &retrieved; return 0; }
uint32_t DALockModuleData(DARetrievedDoc r, void ***slots) { r->locked++; *slots = r->slots; return 0; }
uint32_t DAUnlockModuleData(DARetrievedDoc r) { r->locked--; return 0; }
uint32_t DADestroyModuleData(DARetrievedDoc r) { (void)r; return 0; }
uint32_t DAGetHChunker(DAHandle d, CHHandle *ch) { (void)d; *ch = &chunker; return 0; }
uint32_t DAGetOption(DARetrievedDoc r, uint32_t o, uint32_t f, uint32_t *v) { (void)r; (void)o; (void)f; *v = 0; return 0; }
uint32_t DAOpenDocument(DAHandle *n, uint32_t k, void *s, uint32_t f) { (void)n; (void)k; (void)s; (void)f; return 1; }
uint32_t DASetOption(DAHandle d, uint32_t o, const void *v, uint32_t s) { (void)d; (void)o; (void)v; (void)s; return 1; }
uint32_t DACloseDocument(DAHandle d) { (void)d; return 0; }
uint32_t UTGetOSCharSet(void) { return 1252; }
uint32_t CHGetItem(CHHandle c, uint32_t k, uint32_t i, void *info, uint32_t *n) { (void)c; (void)k; (void)i; (void)info; (void)n; return 1; }
uint32_t CHNextItemId(CHHandle c, uint32_t k, uint32_t i, uint32_t *n) { (void)c; (void)k; (void)i; (void)n; return 1; }
uint32_t CHGetItemId(CHHandle c, uint32_t k, uint32_t i, uint32_t *n) { (void)c; (void)k; (void)i; (void)n; return 1; }
uint32_t CHGetItemCount(CHHandle c, uint32_t k, uint32_t *n) { (void)c; (void)k; (void)n; return 1; }
uint32_t CHGetItemCountById(CHHandle c, uint32_t k, uint32_t i, uint32_t *n) { (void)c; (void)k; (void)i; (void)n; return 1; }
uint32_t CHGetRunFromItemId(CHHandle c, uint32_t i, uint32_t *r) { (void)c; (void)i; (void)r; return 1; }
uint32_t CHGetRunInfo(CHHandle c, uint32_t r, uint32_t m, void *info) { (void)c; (void)r; (void)m; (void)info; return 1; }
uint32_t CHGetSectionInfo(CHHandle c, uint32_t s, void *info) { (void)c; (void)s; (void)info; return 1; }
uint32_t CAOpenContent(DAHandle d, CAHandle *c) { (void)d; (void)c; return 1; }
uint32_t CAReadFirst(CAHandle c, void *r) { (void)c; (void)r; return 1; }
uint32_t CAReadNext(CAHandle c, void *r) { (void)c; (void)r; return 1; }
uint32_t CASeek(CAHandle c, const uint32_t *p) { (void)c; (void)p; return 1; }
uint32_t CACloseContent(CAHandle c) { (void)c; return 0; }

static int heapTag;
void *GetProcessHeap(void) { return &heapTag; }
void *HeapAlloc(void *h, uint32_t flags, size_t bytes) {
    void *p;
    (void)h;
    p = (flags & 8) != 0 ? calloc(1, bytes) : malloc(bytes);
    if (p != NULL) heapBlocks++;
    return p;
}
void *HeapReAlloc(void *h, uint32_t flags, void *block, size_t bytes) { (void)h; (void)flags; return realloc(block, bytes); }
int HeapFree(void *h, uint32_t flags, void *block) { (void)h; (void)flags; if (block != NULL) { free(block); heapBlocks--; } return 1; }
void *GlobalAlloc(unsigned flags, size_t bytes) { (void)flags; return malloc(bytes); }
void *GlobalLock(void *mem) { return mem; }
int GlobalUnlock(void *mem) { (void)mem; return 1; }
void *GlobalFree(void *mem) { free(mem); return NULL; }
int DisableThreadLibraryCalls(void *module) { (void)module; entryCalls++; return 1; }

int main(void) {
    uint32_t rc;
    if (entryCalls != 1) { fprintf(stderr, "library entry ran %d times\n", entryCalls); return 1; }
    rc = ANInit(&doc, NULL, NULL, NULL);
    if (rc != 0 || retrieved.slots[151] == NULL || retrieved.locked != 0) { fprintf(stderr, "ANInit %u\n", rc); return 1; }
    rc = ANDeInit(&doc);
    if (rc != 0 || retrieved.slots[151] != NULL || heapBlocks != 0) { fprintf(stderr, "ANDeInit %u, %d blocks\n", rc, heapBlocks); return 1; }
    printf("bound and released with a host of its own\n");
    return 0;
}
