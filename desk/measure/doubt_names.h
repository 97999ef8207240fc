#ifndef QVTESTER_DESK_MEASURE_DOUBT_NAMES_H_
#define QVTESTER_DESK_MEASURE_DOUBT_NAMES_H_

#include <string>
#include <vector>

namespace qv {

/// What a measured run may be doubted for.
enum class Doubt {
  kDecoderComplaint,
  kFilmCut,
  kClipped,
  kMirrored,
  kImplausibleMarks,
  kOblique,
  kImpossibleFigure,
  kNoPlainEdge,
  kUnevenLight,
  kNoise,
  kUnevenPatches,
  kNoPlainTarget,
  kLargeDarkAreas,
  kTooManySpots,
  kDotsInNoise,
  kTooManyDots,
  kSmallRegion,
  kMapsDiffer,
  kMapNotAgreed,
  kRobustMap,
  kNotRegistered,
  kPrintCutOff,
};

struct DoubtInfo {
  Doubt doubt;
  const char* name;  // in records, and in a limits file that accepts it
  const char* meaning;
};

/// All of them, as they may be accepted.
const std::vector<DoubtInfo>& Doubts();
const DoubtInfo& Info(Doubt doubt);
/// None where no doubt has this name.
const DoubtInfo* FindDoubt(const std::string& name);

/// The table of the documents.
std::string DoubtTable();

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_DOUBT_NAMES_H_
