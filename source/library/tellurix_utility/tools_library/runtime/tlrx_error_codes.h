// Every numbered code of the program, once: its name and its value,
// PEC * 65280 + SEC + 1 (SEC -1 for a class's own code). The texts are in
// the catalogues; the exit status follows from the class (fdfExitStatus).
// Tests check this table against the catalogue and the README's exit-status
// table against this one.
#pragma once

#include <cstdint>

#define TLRX_ERROR_CODES(X)                                                                                        \
  X(CTLRX_WARNING_STATUS, 65280)            /* completed with warnings */                                        \
  X(CTLRX_ERR_TIFF_ARGUMENTS, 130560)       /* quick-look argument vector without raster and TIFF */             \
  X(CTLRX_WARN_LINES_PADDED, 130561)        /* raster lines never written padded with zeros */                   \
  X(CTLRX_ERR_TIFF_HEADER_MISSING, 130562)  /* quick-look input header cannot be read */                         \
  X(CTLRX_ERR_TIFF_RASTER_OPEN, 130563)     /* quick-look input raster cannot be opened */                       \
  X(CTLRX_ERR_TIFF_EMPTY_SAMPLE, 130564)    /* no valid value in the quick-look sample */                        \
  X(CTLRX_ERR_TIFF_CREATE, 130565)          /* TIFF cannot be created, written or renamed */                     \
  X(CTLRX_ERR_TIFF_HEADER_WRITE, 130566)    /* TIFF header cannot be written */                                  \
  X(CTLRX_ERR_TIFF_HISTOGRAM, 130567)       /* histogram of the sample cannot be built */                        \
  X(CTLRX_ERR_ALLOCATION, 195840)           /* memory allocation */                                              \
  X(CTLRX_ERR_WORKING_FILE_REMOVE, 261120)  /* the working file cannot be removed */                             \
  X(CTLRX_ERR_FILE_PARSE, 261121)           /* cannot be parsed, unexpected format or layout, misuse */          \
  X(CTLRX_ERR_FILE_OPEN, 261122)            /* cannot be opened (or is missing) */                               \
  X(CTLRX_ERR_FILE_COPY, 261123)            /* cannot be copied */                                               \
  X(CTLRX_ERR_FILE_WRITE, 261124)           /* cannot be written or positioned for writing */                    \
  X(CTLRX_ERR_FILE_READ, 261125)            /* cannot be read, positioned for reading, or is short */            \
  X(CTLRX_ERR_FILE_RENAME, 261126)          /* cannot be renamed */                                              \
  X(CTLRX_ERR_INTERRUPTED, 326400)          /* interrupted by the operator */                                    \
  X(CTLRX_ERR_PARAMETER_FILE, 456960)       /* command parameters */                                             \
  X(CTLRX_ERR_WINDOW_SIZE, 456961)          /* window size out of the allowed range */                           \
  X(CTLRX_ERR_ARGUMENTS, 456962)            /* too few or clashing arguments */                                  \
  X(CTLRX_ERR_UNKNOWN_COMMAND, 456963)      /* unknown command */                                                \
  X(CTLRX_ERR_IMAGES_INCOMPATIBLE, 652801)  /* images are not compatible */                                      \
  X(CTLRX_ERR_PIXELS_DIFFER, 652802)        /* pixels per line differ between inputs */                          \
  X(CTLRX_ERR_LINES_DIFFER, 652803)         /* lines differ between inputs */                                    \
  X(CTLRX_ERR_IMAGE_TOO_SMALL, 652804)      /* image too small for the processing window */                      \
  X(CTLRX_ERR_IMAGE_SIZES, 652805)          /* image sizes are not valid */                                      \
  X(CTLRX_ERR_OUTPUT_SIZE, 652806)          /* output size is not valid */                                       \
  X(CTLRX_ERR_SIZE_MISMATCH, 652807)        /* lines or pixels of the two images do not match */                 \
  X(CTLRX_ERR_COREG_WINDOW, 652808)         /* co-registration window outside the image */                       \
  X(CTLRX_ERR_COREG_POINTS, 652809)         /* too few valid co-registration points */                           \
  X(CTLRX_ERR_COREG_INIT, 652810)           /* co-registration cannot be initialised (sizes, cell types, FFT) */ \
  X(CTLRX_ERR_COREG_CENTRAL, 652811)        /* central window gives no initial shift */                          \
  X(CTLRX_ERR_COREG_COARSE, 652812)         /* coarse (amplitude) shift estimation failed */                     \
  X(CTLRX_ERR_COREG_FINE, 652813)           /* fine shift estimation failed */                                   \
  X(CTLRX_ERR_SETTING_MISSING, 783360)      /* start-up setting missing */                                       \
  X(CTLRX_ERR_DS_DECLARATION, 848640)       /* bad declaration, failed description copy */                       \
  X(CTLRX_ERR_DS_CHECK, 848641)             /* field without storage, mandatory field missing */                 \
  X(CTLRX_ERR_DS_FIELD_MISSING, 848642)     /* key names no field, element without value */                      \
  X(CTLRX_ERR_DS_SECTION_MISSING, 848643)   /* section not declared */                                           \
  X(CTLRX_ERR_DS_TYPE, 848644)              /* shape or value type not accepted */                               \
  X(CTLRX_ERR_DS_NOT_SET, 848645)           /* value never set */                                                \
  X(CTLRX_ERR_DS_RANGE, 848646)             /* index outside storage */                                          \
  X(CTLRX_ERR_UNEXPECTED, 913920)           /* unexpected exception */                                           \
  X(CTLRX_ERR_UNEXPECTED_RASTER, 913921)    /* unexpected exception in a raster file operation */                \
  X(CTLRX_ERR_UNEXPECTED_EXIT, 913922)      /* unexpected exception while deleting files at exit */

#define TLRX_DECLARE_ERROR_CODE(theName, theCode) constexpr int32_t theName = theCode;
TLRX_ERROR_CODES(TLRX_DECLARE_ERROR_CODE)
#undef TLRX_DECLARE_ERROR_CODE

struct STLRXErrorCode {
  int32_t mCode;
  const char *mName;
};

// The table in code order.
#define TLRX_ERROR_CODE_ENTRY(theName, theCode) {theCode, #theName},
inline constexpr STLRXErrorCode CTLRX_ERROR_CODE_TABLE[] = {TLRX_ERROR_CODES(TLRX_ERROR_CODE_ENTRY)};
#undef TLRX_ERROR_CODE_ENTRY
