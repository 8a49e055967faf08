/* The functions of the toolkit's sibling modules that the library calls: data
 * access, utility, chunker and content access. They live outside the library; a
 * host links its own modules (or the in-tree stand-in) that define them. */
#ifndef ANNO_HOSTS_MODULES_H
#define ANNO_HOSTS_MODULES_H

#include <stdint.h>

#include "anno/anno.h"

#if defined(_WIN32) && defined(ANNO_BUILDING_TOOLKIT)
#define AN_MODULE_API __declspec(dllexport)
#elif defined(__GNUC__)
#define AN_MODULE_API __attribute__((visibility("default")))
#else
#define AN_MODULE_API
#endif

#ifdef __cplusplus
extern "C" {
#endif

/* Chunker records: the caller provides the record, the chunker fills it. */
typedef struct CHItemInfo {
    uint32_t field1; /* class 0: item type; class 16: first item id */
    uint32_t field2; /* text item: first character id; type 68: range code; class 16: range code */
    uint32_t field3; /* text item: number of characters */
    uint32_t reserved[5];
} CHItemInfo;

typedef struct CHRunInfo {
    uint32_t field1;
    uint32_t field2; /* the run's first id */
    uint32_t field3; /* the run's last id */
    uint32_t reserved[5];
} CHRunInfo;

typedef struct CHSectionInfo {
    uint32_t field1;
    uint32_t field2;
    uint32_t field3; /* the section's last id */
    uint32_t reserved[5];
} CHSectionInfo;

/* The record of CAReadFirst and CAReadNext. */
typedef struct CAReadRecord {
    uint32_t size; /* 48 */
    uint32_t zero;
    uint32_t room;      /* in: bytes left in the buffer */
    uint32_t type;      /* out: 1 text, 2 span start, 3 span end, 5 end of content */
    uint32_t flags;     /* out: span and text-not-taken flags */
    uint32_t charCount; /* out, type 1 */
    uint32_t charSet;   /* out, type 1 */
    uint16_t itemIndex; /* out, type 1: low 16 bits of the item id */
    uint8_t unused[6];
    uint32_t written; /* out, type 1: bytes written into the buffer */
    void *buffer;     /* in: where the next piece's text goes */
} CAReadRecord;

#if defined(__cplusplus)
static_assert(sizeof(CHItemInfo) == 32, "CHItemInfo is 32 bytes");
static_assert(sizeof(CHRunInfo) == 32, "CHRunInfo is 32 bytes");
static_assert(sizeof(CHSectionInfo) == 32, "CHSectionInfo is 32 bytes");
static_assert(sizeof(CAReadRecord) == 48, "CAReadRecord is 48 bytes");
static_assert(offsetof(CAReadRecord, itemIndex) == 28, "CAReadRecord.itemIndex");
static_assert(offsetof(CAReadRecord, written) == 36, "CAReadRecord.written");
static_assert(offsetof(CAReadRecord, buffer) == 40, "CAReadRecord.buffer");
#endif

/* Data access and utility. */
AN_MODULE_API uint32_t DAGetAnno(DAHandle doc, void **instance);
AN_MODULE_API uint32_t DARetrieveDocHandle(DAHandle doc, DARetrievedDoc *retrieved);
AN_MODULE_API uint32_t DALockModuleData(DARetrievedDoc retrieved, void ***slots);
AN_MODULE_API uint32_t DAUnlockModuleData(DARetrievedDoc retrieved);
AN_MODULE_API uint32_t DADestroyModuleData(DARetrievedDoc retrieved);
AN_MODULE_API uint32_t DAGetHChunker(DAHandle doc, CHHandle *chunker);
AN_MODULE_API uint32_t DAGetOption(DARetrievedDoc retrieved, uint32_t option, uint32_t flags,
                                   uint32_t *value);
AN_MODULE_API uint32_t DAOpenDocument(DAHandle *newDoc, uint32_t kind, void *source,
                                      uint32_t flags);
AN_MODULE_API uint32_t DASetOption(DAHandle doc, uint32_t option, const void *value, uint32_t size);
AN_MODULE_API uint32_t DACloseDocument(DAHandle doc);
AN_MODULE_API uint32_t UTGetOSCharSet(void);

/* Chunker. */
AN_MODULE_API uint32_t CHGetItem(CHHandle ch, uint32_t idClass, uint32_t id, CHItemInfo *info,
                                 uint32_t *nextId);
AN_MODULE_API uint32_t CHNextItemId(CHHandle ch, uint32_t idClass, uint32_t id, uint32_t *next);
AN_MODULE_API uint32_t CHGetItemId(CHHandle ch, uint32_t idClass, uint32_t index, uint32_t *id);
AN_MODULE_API uint32_t CHGetItemCount(CHHandle ch, uint32_t idClass, uint32_t *count);
AN_MODULE_API uint32_t CHGetItemCountById(CHHandle ch, uint32_t idClass, uint32_t id,
                                          uint32_t *count);
AN_MODULE_API uint32_t CHGetRunFromItemId(CHHandle ch, uint32_t id, uint32_t *run);
AN_MODULE_API uint32_t CHGetRunInfo(CHHandle ch, uint32_t run, uint32_t mode, CHRunInfo *info);
AN_MODULE_API uint32_t CHGetSectionInfo(CHHandle ch, uint32_t section, CHSectionInfo *info);

/* Content access. */
AN_MODULE_API uint32_t CAOpenContent(DAHandle doc, CAHandle *content);
AN_MODULE_API uint32_t CAReadFirst(CAHandle content, CAReadRecord *read);
AN_MODULE_API uint32_t CAReadNext(CAHandle content, CAReadRecord *read);
AN_MODULE_API uint32_t CASeek(CAHandle content, const uint32_t *position);
AN_MODULE_API uint32_t CACloseContent(CAHandle content);

#ifdef __cplusplus
} /* extern "C" */
#endif

/* Ids, classes and values of the module protocol that the library relies on. */
#ifdef __cplusplus
constexpr uint32_t ANMOD_SLOT_ANNO = 151;  /* module-data slot of the annotation state */
constexpr uint32_t ANMOD_SLOT_COUNT = 152; /* module-data slots at least present */
constexpr uint32_t ANMOD_OPTION_CHARSET =
    338482; /* DAGetOption: bit 0x10 picks ANMOD_CHARSET_WIDE */
constexpr uint32_t ANMOD_OPTION_CHARSET_BIT = 0x10;
constexpr uint32_t ANMOD_CHARSET_WIDE = 0x14B00000; /* two bytes per character */
constexpr uint32_t ANMOD_OPEN_FROM_CHUNKER = 18;    /* DAOpenDocument kind */
constexpr uint32_t ANMOD_SETOPT_CHARSET = 1;        /* DASetOption id */
constexpr uint32_t ANMOD_CLASS_ITEM = 0;
constexpr uint32_t ANMOD_CLASS_SECTION = 1;
constexpr uint32_t ANMOD_CLASS_CHAR = 2;
constexpr uint32_t ANMOD_CLASS_RANGE = 16;
constexpr uint32_t ANMOD_ITEM_TEXT = 7;
constexpr uint32_t ANMOD_ITEM_RANGE_END = 68;
constexpr uint32_t ANMOD_ITEM_SKIP_FIRST = 240;
constexpr uint32_t ANMOD_ITEM_SKIP_LAST = 241;
constexpr uint32_t ANMOD_ITEM_CUT_TYPE = 0; /* with field2 == ANMOD_ITEM_CUT_FIELD */
constexpr uint32_t ANMOD_ITEM_CUT_FIELD = 1;
constexpr uint32_t ANMOD_READ_TEXT = 1;
constexpr uint32_t ANMOD_READ_SPAN_START = 2;
constexpr uint32_t ANMOD_READ_SPAN_END = 3;
constexpr uint32_t ANMOD_READ_END = 5;
constexpr uint32_t ANMOD_READ_NOT_TAKEN = 0x10000; /* type 1: text not taken */
constexpr uint32_t ANMOD_SPAN_HIDDEN_A = 0x10000;  /* spans whose text is not taken */
constexpr uint32_t ANMOD_SPAN_HIDDEN_B = 0x100000;
constexpr uint32_t ANMOD_SPAN_HIDDEN_C = 0x120000;
#endif

#endif /* ANNO_HOSTS_MODULES_H */
