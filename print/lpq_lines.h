// lpq's listing of one queue, read for one job:
//     usbprinter1 is ready and printing
//     Rank    Owner   Job     File(s)                         Total Size
//     active  root    12      report.pdf                      1024 bytes
#pragma once

#include <string_view>

namespace xavo {

// Whether a line of the listing shows the job: a plain substring anywhere
// in the line, header lines included, so a job ID that appears in a
// printer name or a larger job number counts as listed.  Saying "still
// listed" by mistake only makes the caller ask again; saying "gone" by
// mistake would lose track of a job.
inline bool LpqLineListsJob(std::string_view line, std::string_view jobId) {
    return line.find(jobId) != std::string_view::npos;
}

}  // namespace xavo
