// What sanitized builds of tests and program are told; linked into those only.

#include "include/qvtester/indices.h"

// NOLINTBEGIN(bugprone-reserved-identifier,cert-dcl37-c,cert-dcl51-cpp): the sanitizers' own names
extern "C" {
QV_API const char* __asan_default_options() { return "allocator_may_return_null=1"; }
// The font library keeps some memory until the process ends; OpenCV loses a matrix's where `new` fails for its header,
// as one test makes it.
QV_API const char* __lsan_default_suppressions() { return "leak:libfontconfig\nleak:HalfATesterIsNone\n"; }
QV_API const char* __lsan_default_options() { return "print_suppressions=0"; }
}
// NOLINTEND(bugprone-reserved-identifier,cert-dcl37-c,cert-dcl51-cpp)
