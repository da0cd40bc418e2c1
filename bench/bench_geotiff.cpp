// One GeoTIFF quick-look as the commands make it, for bench_geotiff.sh to
// time against gdal_translate: bench_geotiff <raster> <tiff> [saturation].
// The runtime is started from TELLURIX_INIT_DIR like the main program.
#include <cstdio>
#include <cstdlib>

#include "tlrx_enviroment.h"
#include "tlrx_raster_to_geotiff.h"

int main(int argc, char **argv) {
  if (argc < 3) {
    std::fprintf(stderr, "usage: %s <raster> <tiff> [saturation]\n", argv[0]);
    return 2;
  }
  if (!fdfInitEnvironment(true, "bench_geotiff"))
    return 1;
  // A working file present from the start: no waiting for the host's.
  if (FILE *aWorking = std::fopen(fdfGetWorkingFilePath().c_str(), "w")) {
    std::fputs("0\n\n", aWorking);
    std::fclose(aWorking);
  }
  const double aSaturation = argc > 3 ? std::strtod(argv[3], nullptr) : 0.0;
  // The commands' standard arguments.
  return tlrx_raster_to_geotiff(argv[1], argv[2], aSaturation, 1, 1, 1.0, 1.0, false, false, false, false, 254,
                                1000000, nullptr, nullptr, -1, -1, -1, -1, false);
}
