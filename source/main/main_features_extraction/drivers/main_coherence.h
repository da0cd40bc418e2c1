// Coherence command: a single-look complex pair through the interferometric
// chain (co-registration when asked, interferogram, synthetic phase,
// flattening, the optional adaptive filter, coherence, GeoTIFF copy).
#pragma once

#include <cstdint>
#include <string>
#include <vector>

// Driver of "main_coherence#": theArguments names the XML parameter file.
int32_t main_coherence(const char *theArguments);

// theName without a trailing theSuffix, compared exactly and, when that
// fails, regardless of case; theName itself when it does not end so.
std::string fdfCutSuffix(const std::string &theName, const char *theSuffix);

// The names the chain derives from the output root and the pair.
struct SCoherenceNames {
  std::string mRoot;        // the output root without a trailing "_cc"
  std::string mFolder;      // folder of mRoot, with its separator
  std::string mMasterPower; // mFolder + master file name (no "_slc") + "_pwr"
  std::string mSlavePower;
};
SCoherenceNames fdfCoherenceNames(const std::string &theOutputRoot, const std::string &theMaster,
                                  const std::string &theSlave);

// Step plan over the command's step table: the interferogram (0), the split
// synthetic phase (9) and flattening (10) or, with theSplit off, the orbit
// phase of method theOrbitMethod (6 or 7, any other code raises 456960) and
// the phase slope (8); the filter (2) with theFilter, the coherence (1), and
// the GeoTIFF copy (3) with theTiff.
std::vector<int> fdfCoherencePlan(bool theSplit, int theOrbitMethod, bool theFilter, bool theTiff);
