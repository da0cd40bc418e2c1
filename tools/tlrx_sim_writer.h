// Output of the simulator: values of one line turned into the cells of the
// chosen type, and one raster written line by line through the raster file
// with its standard header beside it.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tlrx_description_section.h"
#include "tlrx_raster_file.h"
#include "tlrx_sim_options.h"

// Physical values into cells: value / scale factor, rounded and clipped for
// integer types (clipped cells are counted), both parts for complex types
// (unsigned complex types keep |re| and |im|). Invalid pixels get the null
// value; a valid pixel whose cell would read as no data is moved to the
// nearest value that does not, so no-data pixels are exactly the invalid ones.
class CSimCellEncoder {
public:
  CSimCellEncoder(int32_t theCellType, double theNull, double theScaleFactor);

  size_t lineBytes(int32_t thePixels) const;
  // theIm is read only for complex types.
  void encode(const double *theRe, const double *theIm, const uint8_t *theValid, int32_t thePixels,
              uint8_t *theCells);
  int64_t getClipped() const { return mClipped; }

private:
  template <typename T>
  T toCell(double theValue);
  template <typename T>
  T awayFromNull(T theCell) const;
  template <typename T>
  void encodeReal(const double *theRe, const uint8_t *theValid, int32_t thePixels, T *theCells);
  template <typename T, bool theUnsigned>
  void encodeComplex(const double *theRe, const double *theIm, const uint8_t *theValid, int32_t thePixels,
                     T *theCells);

  int32_t mCellType;
  double mNull;
  SNoData mNoData; // the readers' rule for mNull
  double mScaleFactor;
  int64_t mClipped = 0;
};

// What distinguishes one written image from the others of the run.
struct SSimImageSpec {
  std::string mName;
  SSimGrid mGrid;
  int32_t mCellType = CTLRX_CELL_FLOAT;
  std::string mUnits;
  int64_t mDate = 0;  // microseconds since 1970
  std::string mNote;  // "SIMULATION" entry of the header
};

// The standard header of an image: layout, units, null value, byte order,
// scale factors, acquisition time and, for geocoded runs, the map grid.
void fdfSimBuildHeader(const SSimOptions &theOptions, const SSimImageSpec &theSpec, CDescription &theHeader);

// One raster being written: opened at construction, one line at a time,
// finish() closes the data and writes the header. Only one line of cells is
// ever held.
class CSimRasterWriter {
public:
  CSimRasterWriter(const SSimOptions &theOptions, const SSimImageSpec &theSpec);
  CSimRasterWriter(const CSimRasterWriter &) = delete;
  CSimRasterWriter &operator=(const CSimRasterWriter &) = delete;

  void putLine(int32_t theLine, const double *theRe, const double *theIm, const uint8_t *theValid);
  void finish();
  const SSimImageSpec &getSpec() const { return mSpec; }
  // The header finish() writes; fields may be added before.
  CDescription &getHeader() { return mHeader; }
  int64_t getClipped() const { return mEncoder.getClipped(); }

private:
  SSimImageSpec mSpec;
  CDescription mHeader;
  CSimCellEncoder mEncoder;
  std::vector<uint8_t> mCells;
  CRasterFile mFile;
};
