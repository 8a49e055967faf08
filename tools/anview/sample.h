// The document and annotations anview shows when it is given no document.
#ifndef ANVIEW_SAMPLE_H
#define ANVIEW_SAMPLE_H

namespace anview {

extern const char *const kSampleText;
extern const char *const kSampleAnnotations;  // JSON, in the annotation file format

}  // namespace anview

#endif  // ANVIEW_SAMPLE_H
