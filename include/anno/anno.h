/* anno: the annotation library of the document-viewing toolkit.
 *
 * The whole exported interface: 28 functions with C linkage, the records callers
 * pass by pointer, result codes, annotation types and bit values. Compiles as C99
 * and as C++. Every record with a fixed byte layout is checked for size and field
 * offsets at the end of this file.
 *
 * Threading: operations on one document must not run on two threads at once; a
 * global style table must not change while a document bound to it is drawn. */
#ifndef ANNO_ANNO_H
#define ANNO_ANNO_H

#include <stddef.h>
#include <stdint.h>

#if defined(_WIN32)
#if defined(ANNO_BUILDING_LIBRARY)
#define AN_API __declspec(dllexport)
#else
#define AN_API __declspec(dllimport)
#endif
#elif defined(__GNUC__)
#define AN_API __attribute__((visibility("default")))
#else
#define AN_API
#endif

/* Lets a named-field union sit inside a record in C99 code built with -pedantic. */
#if defined(__GNUC__)
#define AN_EXTENSION __extension__
#else
#define AN_EXTENSION
#endif

#ifdef __cplusplus
extern "C" {
#endif

/* ---- Handles ------------------------------------------------------------------ */

typedef struct DADocument *DAHandle;      /* a document of the data-access module */
typedef struct DARetrieved *DARetrievedDoc; /* the data-access module's document record */
typedef struct CHChunker *CHHandle;        /* the chunker module */
typedef struct CAContent *CAHandle;        /* the content-access module */
typedef struct ANStyleTable ANStyleTable;  /* a highlight style table (opaque) */
typedef struct ANTextSegList ANTextSegList; /* the cache of an annotation text track (opaque) */

/* ---- Result codes --------------------------------------------------------------- */

#define AN_OK 0u
#define AN_ERR_NOMEM 13u    /* out of memory, or the annotation table is full */
#define AN_ERR_BADARG 15u   /* null handle or pointer, bad type, size or flags */
#define AN_ERR_NOSTATE 18u  /* the document has no annotation state */
#define AN_ERR_NOTFOUND 25u /* nothing found / no further position */

/* ---- Annotation types ------------------------------------------------------------- */

#define AN_TYPE_HILITE 1u      /* range with a display style */
#define AN_TYPE_POINT 2u       /* point carrying a value (result bit 0x04) */
#define AN_TYPE_RANGE 3u       /* range fitted to the document's structure */
#define AN_TYPE_VALUE 4u       /* point carrying a value (result bit 0x08) */
#define AN_TYPE_TEXT 5u        /* inserted annotation text */
#define AN_TYPE_PLACEHOLDER 6u /* one unit of annotation text without characters */
#define AN_TYPE_CUTMARK 7u     /* cut marker */

/* ---- Positions ----------------------------------------------------------------------- */

#define AN_NONE 0xFFFFu               /* no slot */
#define ANPOS_ANNOTEXT 5u             /* kind of a position inside annotation text */
#define ANPOS_NOSUBITEM 0xFFFFFFFFu   /* subItemId of a position on the item itself */

typedef struct ANPos {
    uint32_t itemId;
    uint32_t subItemId;
    uint32_t kind;
    uint32_t textIndex;
} ANPos;

/* ---- Annotation record (96 bytes) ------------------------------------------------------ */

#define AN_RECORD_SIZE_POINT 72u /* normalised size of types 1, 2 and 4 */
#define AN_RECORD_SIZE_SHORT 64u /* normalised size of types 3, 6 and 7 */
#define AN_RECORD_SIZE_TEXT 96u  /* normalised size of type 5 */

typedef struct ANAnnoRecord {
    uint32_t size;
    uint32_t tag;
    ANPos start;
    ANPos end; /* exclusive */
    uint32_t eventMask;
    uint32_t reserved0;
    uint64_t userData;
    uint64_t value;
    AN_EXTENSION union {
        uint32_t style;       /* type 1: the style word */
        const uint16_t *text; /* type 5 on input: the caller's text */
        uint64_t value64;     /* type 2: a value carried, never read */
    };
    uint32_t textLength; /* type 5: units of text */
    uint32_t reserved1;
    uint16_t *textBuffer; /* type 5: the library's own copy */
    uint32_t textCapacity;
    uint32_t reserved2;
} ANAnnoRecord;

/* Caller forms of ANAddAnno that are not a prefix of ANAnnoRecord. The 72-byte forms
 * of types 1, 2 and 4 are ANAnnoRecord itself. */
typedef struct ANRangeDesc { /* type 3, 48 bytes (44 and 40 also accepted) */
    uint32_t size;
    uint32_t tag;
    ANPos start;
    ANPos end;
    uint64_t userData;
} ANRangeDesc;

typedef struct ANTextDesc { /* type 5, 48 bytes */
    uint32_t size;
    uint32_t tag;
    ANPos pos;
    uint64_t userData;
    const uint16_t *text;
    uint32_t textLength;
    uint32_t reserved;
} ANTextDesc;

typedef struct ANPointDesc { /* types 6 and 7, 32 bytes (28 also accepted) */
    uint32_t size;
    uint32_t tag;
    ANPos pos;
    uint64_t userData;
} ANPointDesc;

/* ---- Notification callback --------------------------------------------------------------- */

#define ANNOTIFY_ADDED 1u   /* record: the normalised ANAnnoRecord; detail: type */
#define ANNOTIFY_REMOVED 2u /* record: the removed entry's ANAnnoRecord; detail: type */
#define ANNOTIFY_EVENT 3u   /* record: ANEventRec; detail: 1 when the entry wants it */

typedef uint32_t (*ANCallback)(uint16_t code, uint16_t detail, void *record, void *callbackData);

/* ---- Highlight styles ------------------------------------------------------------------------ */

#define ANHILITESTYLE_SIZE 28u
#define ANHILITESTYLE_SIZE_OLD 24u
#define ANSTYLE_COLOR1 0x1u
#define ANSTYLE_COLOR2 0x2u
#define ANSTYLE_ATTR 0x4u

/* Style word of a type-1 annotation. */
#define ANSTYLEWORD_NUMBER 0x40000000u   /* low 16 bits are a style id */
#define ANSTYLEWORD_NOCOLOR1 0x20000000u /* direct word: color1 does not apply */
#define ANSTYLEWORD_NOCOLOR2 0x10000000u /* direct word: color2 does not apply */

typedef struct ANHiliteStyle {
    uint32_t size;
    uint32_t styleId;
    uint32_t flags;
    uint32_t color1; /* 0x00BBGGRR */
    uint32_t color2; /* 0x00BBGGRR */
    uint16_t attr1;
    uint16_t attr2;
    uint32_t reserved;
} ANHiliteStyle;

/* ---- Tracking ----------------------------------------------------------------------------------- */

#define ANTRACK_NONE 0u
#define ANTRACK_NOMORE 1u
#define ANTRACK_ACTIVE 2u

#define ANTRACK_BIT_RANGE 0x01u
#define ANTRACK_BIT_HILITE 0x02u
#define ANTRACK_BIT_POINT 0x04u
#define ANTRACK_BIT_VALUE 0x08u
#define ANTRACK_BIT_CUTMARK 0x10u
#define ANTRACK_BIT_TEXT 0x20u

typedef struct ANTrackInfo {
    uint32_t rangeActive;
    uint32_t markActive;
    uint32_t color1Set;
    uint32_t color2Set;
    uint32_t attrSet;
    uint32_t color1;
    uint32_t color2;
    uint64_t value;
    uint16_t cursor;
    uint16_t hiliteEntry;
    ANPos nextChange;
    uint32_t attr1;
    uint32_t attr2;
    const uint16_t *textBuffer;
    uint32_t textLength;
    uint64_t userData;
} ANTrackInfo;

typedef struct ANAnnoTextTrack {
    ANTextSegList *segs;
    ANPos firstPos;
    ANPos lastPos;
} ANAnnoTextTrack;

/* ---- Events ------------------------------------------------------------------------------------- */

#define ANEVENT_CLICK1 0x01u
#define ANEVENT_CLICK2 0x02u
#define ANEVENT_CLICK3 0x20u
#define ANEVENT_ENTER 0x04u
#define ANEVENT_LEAVE 0x08u
#define ANEVENT_MOVE 0x10u
#define ANEVENTREC_SIZE 24u

typedef struct ANEventRec {
    uint32_t size;
    uint32_t event;
    uint32_t tag;
    uint64_t userData;
} ANEventRec;

/* ---- Clearing ------------------------------------------------------------------------------------- */

#define ANCLEAR_MASK 0x1000u      /* (tag & value) == value */
#define ANCLEAR_EQUAL 0x2000u     /* tag == value; wins over ANCLEAR_MASK */
#define ANTAG_PROTECTED 0x80000000u /* survives a clear with flags 0 */

/* ---- Finding ---------------------------------------------------------------------------------------- */

#define ANFIND_FIRST 1u  /* first in document order */
#define ANFIND_LAST 2u   /* last in document order */
#define ANFIND_BEFORE 3u /* last ending at or before key */
#define ANFIND_AFTER 4u  /* first starting after key */
#define ANFIND_FROM 5u   /* first starting at or after key */
#define ANFIND_AT 6u     /* first covering key */
#define ANFIND_KINDMASK 0x00FFu
#define ANFIND_MASK 0x1000u  /* tag test: (entry tag & tag) == tag; wins */
#define ANFIND_EQUAL 0x2000u /* tag test: entry tag == tag */
#define ANFIND_AFTER_PREVIOUS 0x0001u /* flags argument, kind ANFIND_AFTER only */
#define ANFINDRECORD_SIZE 72u

typedef struct ANFindRecord {
    uint32_t size;
    uint16_t mode;
    uint16_t reserved;
    uint32_t tag;
    ANPos key;
    uint32_t foundTag;
    ANPos foundStart;
    ANPos foundEnd;
    uint64_t foundUserData;
} ANFindRecord;

/* ---- Position mapping ----------------------------------------------------------------------------------- */

#define ANMAP_ORDINAL_TO_POS 0x1u /* wins when both are set */
#define ANMAP_POS_TO_ORDINAL 0x2u
#define ANMAPRECORD_SIZE 28u

typedef struct ANMapRecord {
    uint32_t size;
    uint32_t flags;
    ANPos pos; /* only itemId and subItemId are read or written */
    uint32_t ordinal;
} ANMapRecord;

/* ---- Document binding --------------------------------------------------------------------------------------- */

/* Makes the annotation state of `doc` and stores it in the document's module data.
 * `globalStyles` (may be null), `callback` (may be null) and `callbackData` are kept
 * as given; the global table stays the caller's. Returns 0 and makes nothing for a
 * null `doc` or a document without a chunker; 13 when the state cannot be allocated;
 * a data-access failure unchanged (a failed module-data lock also destroys the
 * document's module data). A failure leaves the document as it was. */
AN_API uint32_t ANInit(DAHandle doc, ANStyleTable *globalStyles, ANCallback callback,
                       void *callbackData);

/* Frees the annotation state of `doc` with everything it owns: entries and their
 * texts, the per-document styles, character maps and the content document. Leaves
 * userData blocks alone and does not call the callback. Returns 15 (null doc), a
 * data-access failure unchanged (the state then stays), otherwise 0, also when the
 * document has no annotation state. */
AN_API uint32_t ANDeInit(DAHandle doc);

/* Replaces the notification callback and its value; a null callback switches
 * notification off. Returns 15 (null doc), a DAGetAnno failure, 18 (no state) or 0. */
AN_API uint32_t ANSetCallback(DAHandle doc, ANCallback callback, void *callbackData);

/* ---- Annotations ------------------------------------------------------------------------------------------------ */

/* Adds one annotation of `type` (1..7) described by `descriptor`, whose first u32 is
 * its size in bytes: type 1 takes 72, 60 or 48; types 2 and 4 take 72 or 64, type 2
 * also 32; type 3 takes 48, 44 or 40; type 5 takes 48; types 6 and 7 take 32 or 28.
 * The descriptor (and a type-5 text) is only read. Range annotations are fitted to
 * the document's items and cut into pieces with cut markers. On success the
 * callback hears notification 1 once, with the normalised record.
 * A type-1, 3 or 5 annotation with a non-zero userData hands that block over:
 * ANClearUserData frees it, also when the annotation has merged into another.
 * Returns 15 (bad type, null descriptor, size not accepted, null doc, a type-5 text
 * of non-zero length at a null pointer, or a type-5/6 position inside annotation
 * text that its anchor does not have: nothing added), a DAGetAnno failure, 18 (no
 * state), 13 (out of memory or the table is full: not stored, no notification),
 * for type 3 a failure of fitting it (the pieces stored before stay), otherwise 0.
 * The add that takes the table's last place succeeds; the next one gets 13. */
AN_API uint32_t ANAddAnno(DAHandle doc, uint16_t type, const void *descriptor);

/* Removes the annotations of `doc` that `flags` and `value` select and announces
 * each removed entry to the callback (notification 2) after it has left the table.
 *   flags 0       every entry whose tag has bit 31 clear
 *   0x2000        tag == value (bit 31 gives no protection)
 *   0x1000        (tag & value) == value
 *   other         nothing
 * Removing annotation text renumbers the text positions at its anchor; a table
 * left empty is freed.
 * Returns 15 (null doc), a DAGetAnno failure unchanged, 18 (no annotation state),
 * 0 when there is no table; otherwise the last callback result, or 13 when joining
 * two texts ran out of memory (the texts then stay apart, nothing else is lost). */
AN_API uint32_t ANClearAnnos(DAHandle doc, uint16_t flags, uint32_t value);

/* Frees, as process-heap blocks, the userData values that callers gave with
 * annotations of types 1, 3 and 5 through ANAddAnno, once per block, and sets them
 * to 0; also the blocks of such annotations that merged into others or went without
 * a removal notification (texts joined, ranges emptied by a clear), which the document
 * keeps until this call. Values the library did not receive as such blocks (built
 * annotations, copies from another document) are never freed. Works under the
 * module-data lock.
 * Returns 15 (null doc), a DARetrieveDocHandle failure unchanged, otherwise 0. */
AN_API uint32_t ANClearUserData(DAHandle doc);

/* Copies every annotation and per-document style of `src` into `dest`, merged by
 * position, without notification; `src` is unchanged. Texts get buffers of their
 * own; userData values are copied but stay the source's (ANClearUserData on `dest`
 * leaves them). A source style replaces a destination style with the same id. A
 * source without annotations copies nothing, not even styles, and gives 0 without
 * looking at `dest`. Copying a document onto itself changes nothing.
 * Returns 15 (null handle), a DAGetAnno failure, 18 (no state), `src` examined
 * first; otherwise 0, and entries that cannot be inserted (out of memory, table
 * full) are missing from `dest`. */
AN_API uint32_t ANCopyAnnos(DAHandle dest, DAHandle src);

/* Turns the document's own ranges, from the first not yet examined, into styled
 * type-1 highlights (notification 1 each) whose tags have bit 31 set and whose
 * userData is the range's first item id (never freed by ANClearUserData). Every
 * range is examined once: one whose code is not built, whose end item cannot be
 * found or whose highlight cannot be added is passed over for good, and clearing
 * does not bring built ranges back. When the chunker cannot tell how many ranges
 * there are, nothing is examined and a later call starts from the same range.
 * Returns 15 (null doc), a DAGetAnno failure, 18 (no state), otherwise 0. */
AN_API uint32_t ANBuildAnnos(DAHandle doc);

/* ---- Positions ------------------------------------------------------------------------------------------------------ */

/* Returns -1, 0 or 1 as `a` sorts before, equal to or after `b`. Both must be valid. */
AN_API int16_t ANCompPos(const ANPos *a, const ANPos *b);

/* Returns 1 when `pos` lies inside annotation text (kind 5), else 0. */
AN_API uint32_t ANIsAnnoTextPos(const ANPos *pos);

/* Writes the position after `pos` in the walk that merges content and annotation
 * text into `next`. Returns 0, or 25 when there is none or a step failed (`next`
 * is then not written). The position written always sorts after `pos`. */
AN_API uint32_t ANNextPos(DAHandle doc, const ANPos *pos, ANPos *next);

/* Writes the next content position into `next` (zeroed first). A kind-5 position
 * steps to its anchor's content position without looking at `doc`. Returns 0, 15
 * (null doc or pointer), a DAGetAnno failure, 18, or 25 (unknown item, no further
 * item, or a failed step to the next character). */
AN_API uint32_t ANNextChunkerPos(DAHandle doc, const ANPos *pos, ANPos *next);

/* Writes the next annotation-text position into `next`. Returns 0, 15, a DAGetAnno
 * failure, 18, or 25 when there is none. */
AN_API uint32_t ANNextAnnoTextPos(DAHandle doc, const ANPos *pos, ANPos *next);

/* Maps a document-wide character ordinal to a position (flags bit 0, which wins) or a
 * position to an ordinal (bit 1). Only pos.itemId and pos.subItemId are read or
 * written, and only on success; (item, 0xFFFFFFFF) maps to the item's first character
 * or the first one after it. The character maps of the two most recently used chunks
 * stay cached until ANDeInit. Returns 0 (also without writing when the chunk's content
 * gave no characters); 15 (null doc or record, size not 28, no flag, a map that cannot
 * be made or locked); a DAGetAnno failure; 18 (no state, or the content could not be
 * opened: it is not tried again); 25 (an ordinal or position the chunker does not
 * know, or past what the chunk's content gave); 13 (out of memory). A map that failed
 * for memory, a lock or the chunker is not kept: a later call tries again. */
AN_API uint32_t ANMapPosition(DAHandle doc, ANMapRecord *map);

/* ---- Highlight styles ------------------------------------------------------------------------------------------------- */

/* Makes an empty style table in *table. Returns 0, 15 (null pointer) or 13 (*table
 * is then null). */
AN_API uint32_t ANInitGlobalHiliteStyles(ANStyleTable **table);

/* Frees a style table made by ANInitGlobalHiliteStyles. Returns 0 or 15 (null). */
AN_API uint32_t ANDeInitGlobalHiliteStyles(ANStyleTable *table);

/* Copies the style `styleId` (28 bytes) into *style when it is not null. Returns 0
 * found, 15 null table, 25 not found (*style untouched). */
AN_API uint32_t ANGetGlobalHiliteStyle(ANStyleTable *table, uint32_t styleId, ANHiliteStyle *style);

/* Adds a 28- or 24-byte style record, replacing the one with the same id. A 24-byte
 * record is stored widened, with attr2 0xFFFF and reserved 0. Returns 0, 15 (null
 * table or record, other size), 13 (out of memory, or a new id when the table already
 * holds 65529 styles: the table unchanged). */
AN_API uint32_t ANAddGlobalHiliteStyle(ANStyleTable *table, const ANHiliteStyle *style);

/* Looks a style up in the document's table, then in its global table. Returns 1 when
 * found (copied into *style when not null), 0 otherwise; not a result code. */
AN_API uint32_t ANGetHiliteStyle(DAHandle doc, uint32_t styleId, ANHiliteStyle *style);

/* Adds a style to the document's own table. Returns 15 (null doc), a DAGetAnno
 * failure, 18 (no state), then as ANAddGlobalHiliteStyle. */
AN_API uint32_t ANAddHiliteStyle(DAHandle doc, const ANHiliteStyle *style);

/* ---- Tracking ------------------------------------------------------------------------------------------------------------- */

/* Starts a drawing walk at `start`. Returns ANTRACK_NONE (null pointer, no state:
 * the record untouched; no annotations: only rangeActive and the three style flags
 * cleared), ANTRACK_NOMORE (nothing reaches `start`) or ANTRACK_ACTIVE. markActive is
 * left as the caller had it. */
AN_API uint32_t ANStartAnnoTrack(DAHandle doc, const ANPos *start, ANTrackInfo *track);

/* Ends a drawing walk. Reads nothing, changes nothing, returns 0. */
AN_API uint32_t ANEndAnnoTrack(DAHandle doc, ANTrackInfo *track);

/* Reports what changes at `pos`, visited in ascending order, as ANTRACK_BIT_* bits,
 * with the details in *track. 0 before track->nextChange, and 0 for a null document,
 * position or record. Allocates nothing. */
AN_API uint32_t ANTrackAnno(DAHandle doc, const ANPos *pos, ANTrackInfo *track);

/* Prepares an annotation text track (one allocation). Returns 0, 13 (the record is
 * then all zero) or 15 (null track). `doc` is not read. */
AN_API uint32_t ANStartAnnoTextTrack(DAHandle doc, ANAnnoTextTrack *track);

/* Frees what a text track holds and zeroes it. Returns 0. `doc` is not read. */
AN_API uint32_t ANEndAnnoTextTrack(DAHandle doc, ANAnnoTextTrack *track);

/* ---- Queries and events ------------------------------------------------------------------------------------------------- */

/* Delivers event `event` at `pos` to the annotations there, walking from slot
 * `entry` (AN_NONE for none), through the callback (notification 3). A move
 * (ANEVENT_MOVE) becomes leave and enter events against the previous move. Returns
 * the last callback result, or 0. An `entry` that names no entry of the table
 * delivers nothing, returns 0 and leaves the hover state alone. */
AN_API uint32_t ANAnnoEvent(DAHandle doc, uint32_t event, uint16_t entry, const ANPos *pos);

/* Reads the unit of annotation text at `pos` through the cache in `track`. Returns
 * 5 (a text unit in *unit), 6 (a placeholder, *unit 0), 25 (no text there), 15 (null
 * doc or pointer, or a track not started or already ended), 13 (out of memory: the
 * units copied so far stay cached), 18 (no state), or a DAGetAnno failure. */
AN_API uint32_t ANGetAnnoText(DAHandle doc, ANAnnoTextTrack *track, const ANPos *pos, uint16_t *unit);

/* Searches the annotations as find->mode says and writes the found one's tag,
 * extent and userData. Returns 0 found, 25 none (out fields untouched), 15 (null doc,
 * size not 72), 18 (no state), or a DAGetAnno failure. */
AN_API uint32_t ANFindAnno(DAHandle doc, uint16_t flags, ANFindRecord *find);

#ifdef __cplusplus
} /* extern "C" */
#endif

/* ---- Layout checks ---------------------------------------------------------------------------------------------------------- */

#if defined(__cplusplus)
#define AN_STATIC_ASSERT(cond, msg) static_assert(cond, msg)
#elif defined(__GNUC__)
/* _Static_assert is C11; GCC and clang accept it as an extension in C99. */
#define AN_STATIC_ASSERT(cond, msg) __extension__ _Static_assert(cond, msg)
#else
#define AN_STATIC_ASSERT(cond, msg) _Static_assert(cond, msg)
#endif

AN_STATIC_ASSERT(sizeof(void *) == 8, "anno is built for 64-bit targets");
AN_STATIC_ASSERT(sizeof(ANPos) == 16, "ANPos is 16 bytes");
AN_STATIC_ASSERT(offsetof(ANPos, kind) == 8, "ANPos.kind");
AN_STATIC_ASSERT(offsetof(ANPos, textIndex) == 12, "ANPos.textIndex");
AN_STATIC_ASSERT(sizeof(ANAnnoRecord) == 96, "ANAnnoRecord is 96 bytes");
AN_STATIC_ASSERT(offsetof(ANAnnoRecord, tag) == 4, "ANAnnoRecord.tag");
AN_STATIC_ASSERT(offsetof(ANAnnoRecord, start) == 8, "ANAnnoRecord.start");
AN_STATIC_ASSERT(offsetof(ANAnnoRecord, end) == 24, "ANAnnoRecord.end");
AN_STATIC_ASSERT(offsetof(ANAnnoRecord, eventMask) == 40, "ANAnnoRecord.eventMask");
AN_STATIC_ASSERT(offsetof(ANAnnoRecord, userData) == 48, "ANAnnoRecord.userData");
AN_STATIC_ASSERT(offsetof(ANAnnoRecord, value) == 56, "ANAnnoRecord.value");
AN_STATIC_ASSERT(offsetof(ANAnnoRecord, style) == 64, "ANAnnoRecord.style");
AN_STATIC_ASSERT(offsetof(ANAnnoRecord, text) == 64, "ANAnnoRecord.text");
AN_STATIC_ASSERT(offsetof(ANAnnoRecord, textLength) == 72, "ANAnnoRecord.textLength");
AN_STATIC_ASSERT(offsetof(ANAnnoRecord, textBuffer) == 80, "ANAnnoRecord.textBuffer");
AN_STATIC_ASSERT(offsetof(ANAnnoRecord, textCapacity) == 88, "ANAnnoRecord.textCapacity");
AN_STATIC_ASSERT(sizeof(ANRangeDesc) == 48, "ANRangeDesc is 48 bytes");
AN_STATIC_ASSERT(offsetof(ANRangeDesc, userData) == 40, "ANRangeDesc.userData");
AN_STATIC_ASSERT(sizeof(ANTextDesc) == 48, "ANTextDesc is 48 bytes");
AN_STATIC_ASSERT(offsetof(ANTextDesc, userData) == 24, "ANTextDesc.userData");
AN_STATIC_ASSERT(offsetof(ANTextDesc, text) == 32, "ANTextDesc.text");
AN_STATIC_ASSERT(offsetof(ANTextDesc, textLength) == 40, "ANTextDesc.textLength");
AN_STATIC_ASSERT(sizeof(ANPointDesc) == 32, "ANPointDesc is 32 bytes");
AN_STATIC_ASSERT(offsetof(ANPointDesc, userData) == 24, "ANPointDesc.userData");
AN_STATIC_ASSERT(sizeof(ANHiliteStyle) == 28, "ANHiliteStyle is 28 bytes");
AN_STATIC_ASSERT(offsetof(ANHiliteStyle, attr1) == 20, "ANHiliteStyle.attr1");
AN_STATIC_ASSERT(offsetof(ANHiliteStyle, attr2) == 22, "ANHiliteStyle.attr2");
AN_STATIC_ASSERT(offsetof(ANHiliteStyle, reserved) == 24, "ANHiliteStyle.reserved");
AN_STATIC_ASSERT(sizeof(ANTrackInfo) == 96, "ANTrackInfo is 96 bytes");
AN_STATIC_ASSERT(offsetof(ANTrackInfo, color2) == 24, "ANTrackInfo.color2");
AN_STATIC_ASSERT(offsetof(ANTrackInfo, value) == 32, "ANTrackInfo.value");
AN_STATIC_ASSERT(offsetof(ANTrackInfo, cursor) == 40, "ANTrackInfo.cursor");
AN_STATIC_ASSERT(offsetof(ANTrackInfo, hiliteEntry) == 42, "ANTrackInfo.hiliteEntry");
AN_STATIC_ASSERT(offsetof(ANTrackInfo, nextChange) == 44, "ANTrackInfo.nextChange");
AN_STATIC_ASSERT(offsetof(ANTrackInfo, attr1) == 60, "ANTrackInfo.attr1");
AN_STATIC_ASSERT(offsetof(ANTrackInfo, attr2) == 64, "ANTrackInfo.attr2");
AN_STATIC_ASSERT(offsetof(ANTrackInfo, textBuffer) == 72, "ANTrackInfo.textBuffer");
AN_STATIC_ASSERT(offsetof(ANTrackInfo, textLength) == 80, "ANTrackInfo.textLength");
AN_STATIC_ASSERT(offsetof(ANTrackInfo, userData) == 88, "ANTrackInfo.userData");
AN_STATIC_ASSERT(sizeof(ANAnnoTextTrack) == 40, "ANAnnoTextTrack is 40 bytes");
AN_STATIC_ASSERT(offsetof(ANAnnoTextTrack, firstPos) == 8, "ANAnnoTextTrack.firstPos");
AN_STATIC_ASSERT(offsetof(ANAnnoTextTrack, lastPos) == 24, "ANAnnoTextTrack.lastPos");
AN_STATIC_ASSERT(sizeof(ANEventRec) == 24, "ANEventRec is 24 bytes");
AN_STATIC_ASSERT(offsetof(ANEventRec, tag) == 8, "ANEventRec.tag");
AN_STATIC_ASSERT(offsetof(ANEventRec, userData) == 16, "ANEventRec.userData");
AN_STATIC_ASSERT(sizeof(ANFindRecord) == 72, "ANFindRecord is 72 bytes");
AN_STATIC_ASSERT(offsetof(ANFindRecord, mode) == 4, "ANFindRecord.mode");
AN_STATIC_ASSERT(offsetof(ANFindRecord, tag) == 8, "ANFindRecord.tag");
AN_STATIC_ASSERT(offsetof(ANFindRecord, key) == 12, "ANFindRecord.key");
AN_STATIC_ASSERT(offsetof(ANFindRecord, foundTag) == 28, "ANFindRecord.foundTag");
AN_STATIC_ASSERT(offsetof(ANFindRecord, foundStart) == 32, "ANFindRecord.foundStart");
AN_STATIC_ASSERT(offsetof(ANFindRecord, foundEnd) == 48, "ANFindRecord.foundEnd");
AN_STATIC_ASSERT(offsetof(ANFindRecord, foundUserData) == 64, "ANFindRecord.foundUserData");
AN_STATIC_ASSERT(sizeof(ANMapRecord) == 28, "ANMapRecord is 28 bytes");
AN_STATIC_ASSERT(offsetof(ANMapRecord, pos) == 8, "ANMapRecord.pos");
AN_STATIC_ASSERT(offsetof(ANMapRecord, ordinal) == 24, "ANMapRecord.ordinal");

#endif /* ANNO_ANNO_H */
