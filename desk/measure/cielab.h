#ifndef QVTESTER_DESK_MEASURE_CIELAB_H_
#define QVTESTER_DESK_MEASURE_CIELAB_H_

#include <opencv2/core.hpp>

namespace qv {

// Colour by CIE, in double precision, beside the tests' own values, which refer to a white of 1, 1, 1.

/// Tristimulus values of sRGB's white, D65, as the device's matrix gives them: greys read a* = b* = 0.
inline const cv::Vec3d kD65(0.9505, 1.0, 1.089);
/// The white that the tests' own L*a*b* values refer to.
inline const cv::Vec3d kUnitWhite(1, 1, 1);

/// CIE 1976 L*a*b* of XYZ relative to a white, and back (CIE 15:2004).
cv::Vec3d LabOfXyz(const cv::Vec3d& xyz, const cv::Vec3d& white);
cv::Vec3d XyzOfLab(const cv::Vec3d& lab, const cv::Vec3d& white);

/// L*a*b* relative to D65 of stored levels: red, green, blue, 0 to 255, sRGB (IEC 61966-2-1).
cv::Vec3d LabD65OfSrgb(const cv::Vec3d& rgb);
/// The same colour as one of the tests' own L*a*b* values.
cv::Vec3d LabD65OfOwn(const cv::Vec3d& own);

/// CIEDE2000 colour difference with weights of 1 (CIE 142-2001; formulas of Sharma, Wu and Dalal 2005).
double DeltaE2000(const cv::Vec3d& lab, const cv::Vec3d& other);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_CIELAB_H_
