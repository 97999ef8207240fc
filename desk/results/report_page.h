#ifndef QVTESTER_DESK_RESULTS_REPORT_PAGE_H_
#define QVTESTER_DESK_RESULTS_REPORT_PAGE_H_

#include <string>

namespace qv {

/// The page that shows a report's data, which goes where it says <!--data--> (desk/results/page/report.html).
std::string ReportPage();

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_REPORT_PAGE_H_
