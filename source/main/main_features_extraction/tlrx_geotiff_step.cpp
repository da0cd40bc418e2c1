// The commands' view of the GeoTIFF conversion.
#include "tlrx_geotiff_step.h"

#include "tlrx_raster_to_geotiff.h"

int fdfGeoTiffStep(int theArgc, char **theArgv) { return make_tiff(theArgc, theArgv); }

void fdfMakeQuickLook(const std::string &theRaster, double theSaturation) {
  fdfRasterQuickLook(theRaster.c_str(), theSaturation);
}
