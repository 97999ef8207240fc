#ifndef QVTESTER_DESK_MEASURE_PROPERTIES_H_
#define QVTESTER_DESK_MEASURE_PROPERTIES_H_

#include <string>
#include <vector>

#include "desk/base/json.h"
#include "qvtester/tester.h"

namespace qv {

// Tester properties as values: a number, or a list of numbers for those that hold several.

/// "86=110", "prop_param_86_=110", "52=0.3,0.1,...": added to the properties of a request. Throws Failure (wrong usage)
/// for words of another form, an unknown property, or one that is there already.
void AddProperty(Json& properties, const std::string& words);

/// The properties by index, in order; throws Failure (wrong usage) for one that is unknown, stands there twice, or has
/// a value of another kind.
Json CheckedProperties(const Json& properties);

/// Sets checked properties while it lives. The two histograms that the tester reads in its caller's memory are unset
/// with it; the others stay.
class SetProperties {
 public:
  SetProperties(QVTester& tester, const Json& properties);
  ~SetProperties();
  SetProperties(const SetProperties&) = delete;
  SetProperties& operator=(const SetProperties&) = delete;

 private:
  QVTester& tester_;
  std::vector<std::vector<int>> tables_;
  std::vector<cv::Mat QVTester::*> borrowed_;
};

/// The properties that differ from their defaults, by index.
Json PropertiesOffDefault(QVTester& tester);

/// A property's default; null for one without.
Json DefaultOf(QV_PROPERTY_INDEX index);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_PROPERTIES_H_
