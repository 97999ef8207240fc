#ifndef QVTESTER_DESK_MEASURE_UNCERTAINTY_H_
#define QVTESTER_DESK_MEASURE_UNCERTAINTY_H_

#include <functional>
#include <opencv2/core.hpp>
#include <string>
#include <vector>

// How far a reading may be trusted, after the Guide to the Expression of Uncertainty in Measurement (JCGM 100): what
// one photo tells of its own noise (type A), and what is known of the method beforehand (type B).

namespace qv {

/// The true value lies within `expanded` of the reading 95 times in 100. In the figure's own unit.
struct Uncertainty {
  double standard = 0, expanded = 0, coverage_factor = 0;
  std::string method;
};

/// How an uncertainty is found; the sentences are what `explain` prints.
struct UncertaintyMethod {
  const char* name;  // as records hold it
  const char* text;  // what is done, and which type B parts are in it
};

/// All of them.
const std::vector<UncertaintyMethod>& UncertaintyMethods();

// The names of the rows above.
inline constexpr char kBandsMethod[] = "four bands along the edge, t-interval";
inline constexpr char kResamplingMethod[] = "the region's own noise, drawn again 50 times";
inline constexpr char kPixelMethod[] = "variance of the pixels, carried through the formulas";
inline constexpr char kMeanMethod[] = "variance of blocks of pixels over their number";
inline constexpr char kResidualMethod[] = "residuals of the fit";
inline constexpr char kSpotMethod[] = "errors of simulated spots of unknown softness";
inline constexpr char kStampTrust[] = "steps of the time stamps and of the frames";
inline constexpr char kCourseMethod[] = "scatter between neighbouring frames";
inline constexpr char kRepeatMethod[] = "spread of repeated photos, t-interval";

/// Of expanded uncertainties.
inline constexpr double kCoverage = 0.95;

/// What holds 95 % of Student's distribution, both sides together; 1.96 for infinitely many degrees of freedom.
double StudentFactor(double degrees_of_freedom);

/// Type A of so many degrees of freedom and type B together, by Welch and Satterthwaite.
Uncertainty Combined(double type_a, double degrees_of_freedom, double type_b, const char* method);

/// Half the width of the interval about 0 that holds kCoverage of a distribution; `below(x)` is its share below x, and
/// the answer lies between these bounds.
double HalfWidthHolding(const std::function<double(double)>& below, double low, double high);

/// Of a reading whose error is known, and left in it: the true value lies about where the error puts it as `about`
/// says, with so many degrees of freedom.
Uncertainty OffBy(double error, const Uncertainty& about, double degrees_of_freedom);

/// Type B alone: anything up to `half` to either side is as likely.
Uncertainty Rectangular(double half, const char* method);

/// Of the mean of readings that are alike, with a type B part of their mean. Readings that are no numbers make it NaN.
Uncertainty OfMean(const std::vector<double>& readings, double type_b, const char* method);

/// Of the median of repeated readings: the mean's, times sqrt(pi / 2) for three and more.
Uncertainty OfMedian(const std::vector<double>& readings);
double Median(std::vector<double> readings);
/// Their standard deviation; NaN for a single one.
double Spread(const std::vector<double>& readings);

/// Of a reading of which simulated errors are known: the 95 % quantile of their sizes.
Uncertainty FromErrors(std::vector<double> errors, const char* method);

/// Mean level of a single-channel picture, in so many units a level: noise between neighbouring blocks, not the scene,
/// over their number. Rounding of what is stored, and what a codec does within a block, are in it; a type B part, in
/// levels, is what it does to all blocks alike (MeanShift).
Uncertainty OfMeanLevel(const cv::Mat& picture, double unit = 1, double type_b = 0);

/// Share of a picture's pixels that are not 0 (CV_8U, 0 or 255): as its mean; a count may be one off.
Uncertainty OfShare(const cv::Mat& mask);

/// Standard uncertainty of f(x) for a covariance of x, by first order differences of `step`.
template <int N, typename Function>
double Propagated(const Function& f, const cv::Vec<double, N>& x, const cv::Matx<double, N, N>& covariance,
                  double step) {
  cv::Vec<double, N> gradient;
  for (int i = 0; i < N; ++i) {
    cv::Vec<double, N> high = x;
    cv::Vec<double, N> low = x;
    high[i] += step;
    low[i] -= step;
    gradient[i] = (f(high) - f(low)) / (2 * step);
  }
  return std::sqrt(std::max(gradient.dot(covariance * gradient), 0.0));
}

/// Covariance of the mean of a patch's pixels, CV_8UC3, from differences between neighbours: the patch's own light may
/// fall off. Rounded or cut means get `rounding` levels squared in each channel besides.
cv::Matx33d CovarianceOfMean(const cv::Mat& patch, double rounding);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_UNCERTAINTY_H_
