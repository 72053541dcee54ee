// The results as a table, for a terminal and for a document.
#pragma once

#include <iosfwd>

#include "bench/support/goals.h"

namespace quorvel::bench {

enum class TableForm { aligned, markdown };
void print_results(const Measurements& measurements, TableForm form, std::ostream& out);
void print_growth(const Measurements& measurements, TableForm form, std::ostream& out);

}  // namespace quorvel::bench
