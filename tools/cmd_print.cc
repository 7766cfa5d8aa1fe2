// print, print test-page, job wait, spool clean: jobs you can follow.
//
// The library's job wait looks for a text in every line of lpq's listing,
// header lines included, and lpr reports no job number.  So a job is
// submitted with a title no other job has, which is the handle to wait
// on; the CUPS job number is learned from lpq where the job is still
// listed.
#include <sys/random.h>

#include <chrono>
#include <cstdio>
#include <memory>
#include <thread>

#include "checks.h"
#include "commands.h"
#include "cups_query.h"
#include "report.h"
#include "xavoprinter.h"

namespace cli {
namespace {

// The test page: the library submits this file with no title of its own,
// so lpq lists the job under the file's name.
constexpr char kTestPageTitle[] = "testprint";
// lpq shows a title cut to its column; the handle leads, so it stays whole.
constexpr char kHandlePrefix[] = "xavo-";

struct PrintArgs {
    std::string id;
    std::string file;
    std::string title;
    bool bRemove = false;
    unsigned timeout = 60;
};

std::string NewHandle() {
    unsigned char ab[4] = {};
    if (getrandom(ab, sizeof ab, 0) != static_cast<ssize_t>(sizeof ab)) {
        const auto now = std::chrono::steady_clock::now().time_since_epoch().count();
        for (size_t i = 0; i < sizeof ab; ++i) ab[i] = static_cast<unsigned char>(now >> (8 * i));
    }
    char sz[16];
    std::snprintf(sz, sizeof sz, "%s%02x%02x%02x%02x", kHandlePrefix, ab[0], ab[1], ab[2], ab[3]);
    return sz;
}

// The CUPS job number of the newest listed job whose title begins with
// `title`; null when the job is no longer listed (already printed).
Json JobNumber(const Registry &reg, const std::string &printerId, const std::string &title) {
    const std::string name = CupsNameOf(printerId);
    if (name.empty()) return nullptr;
    const auto jobs = AskJobs(name, reg.bVerbose);
    if (!jobs) return nullptr;
    Json number = nullptr;
    for (const JobLine &job : *jobs) {
        if (!job.title.empty() && title.starts_with(job.title)) number = job.job;
    }
    return number;
}

int Print(const Registry &reg, const PrintArgs &a) {
    Report r(reg.bJson, {"printer_id", "file", "title", "job", "cups_job"});
    r.Set("printer_id", a.id);
    r.Set("file", a.file);
    const std::string handle = NewHandle();
    const std::string title = a.title.empty() ? handle : handle + " " + a.title;
    r.Set("title", title);
    ResetPlatformError();
    if (XAVOPrinterCupsPrintFile(a.id.c_str(), a.file.c_str(), title.c_str(), a.bRemove ? 1 : 0) != 0) {
        return r.Fail("could not print " + a.file + " on " + a.id);
    }
    r.Set("job", handle);
    r.Set("cups_job", JobNumber(reg, a.id, title));
    return r.Succeed();
}

int TestPage(const Registry &reg, const std::string &id) {
    Report r(reg.bJson, {"printer_id", "title", "job", "cups_job"});
    r.Set("printer_id", id);
    ResetPlatformError();
    if (XAVOPrinterCupsPrintTestPage(id.c_str()) != 0) return r.Fail("could not print the test page on " + id);
    r.Set("title", kTestPageTitle);
    r.Set("job", kTestPageTitle);
    r.Set("cups_job", JobNumber(reg, id, kTestPageTitle));
    r.Note(std::string("the library gives the test page no title: waiting on \"") + kTestPageTitle +
           "\" waits for every test page on this printer");
    return r.Succeed();
}

int JobWait(const Registry &reg, const PrintArgs &a) {
    Report r(reg.bJson, {"printer_id", "job", "complete", "waited_seconds"});
    r.Set("printer_id", a.id);
    r.Set("job", a.file);
    const auto start = std::chrono::steady_clock::now();
    const auto deadline = start + std::chrono::seconds(a.timeout);
    const auto waited = [&] {
        return std::chrono::duration_cast<std::chrono::seconds>(std::chrono::steady_clock::now() - start).count();
    };
    for (;;) {
        ResetPlatformError();
        const int32_t res = XAVOPrinterCupsJobWaitComplete(a.id.c_str(), a.file.c_str());
        if (res < 0) return r.Fail("could not read the queue of " + a.id);
        if (res == 0) {
            r.Set("complete", true);
            r.Set("waited_seconds", waited());
            return r.Succeed();
        }
        if (std::chrono::steady_clock::now() >= deadline) {
            r.Set("complete", false);
            r.Set("waited_seconds", waited());
            return r.FailWithoutCode("job " + a.file + " is still listed after " + std::to_string(a.timeout) + " s");
        }
        Progress("job " + a.file + " still listed (" + std::to_string(waited()) + " s)...");
        std::this_thread::sleep_for(std::chrono::seconds(1));
    }
}

int SpoolClean(const Registry &reg) {
    Report r(reg.bJson, {"cleaned", "jobs_left"});
    ResetPlatformError();
    if (XAVOPrinterCleanSpool() != 0) {
        r.Set("cleaned", false);
        return r.Fail("could not empty the spool directory");
    }
    // lpq -a lists nothing, and succeeds, when it cannot reach the
    // scheduler: ask first whether there is one to reach.
    const auto jobs = AskQueues(reg.bVerbose) ? AskJobs("", reg.bVerbose) : std::nullopt;
    if (!jobs) {
        r.Set("cleaned", false);
        return r.FailWithoutCode("the spool directory was emptied, but CUPS could not be asked whether jobs are "
                                 "left (is cupsd running?)");
    }
    r.Set("jobs_left", jobs->size());
    r.Set("cleaned", jobs->empty());
    if (!jobs->empty()) {
        return r.FailWithoutCode("the spool directory was emptied, but CUPS still lists " + std::to_string(jobs->size()) +
                                 " job(s): lprm did not cancel them ('cancel -a' does)");
    }
    return r.Succeed();
}

}  // namespace

void AddPrintCommands(CLI::App &app, Registry &reg) {
    auto a = std::make_shared<PrintArgs>();
    CLI::App *print = app.add_subcommand("print", "print a file on a printer; prints the job's handle for 'job wait'");
    print->add_option("ID", a->id, "printer ID")->check(Text(kMaxPrinterId));
    print->add_option("FILE", a->file, "file to print")->check(CLI::ExistingFile);
    print->add_option("--title", a->title, "job title (after the job's handle)")->check(Text(kMaxField));
    print->add_flag("--remove", a->bRemove, "remove FILE once submitted");
    reg.On(
        print, "xavoprinter print 04b8:0005:SN0001 report.pdf --title Report", [&reg, a] { return Print(reg, *a); },
        [a] { return a->id.empty() || a->file.empty() ? "give ID and FILE" : ""; });

    reg.Leaf(print, "test-page", "print the CUPS test page; its handle is \"testprint\"", Arg::kPrinterId, a->id,
             "xavoprinter print test-page 04b8:0005:SN0001", [&reg, a] { return TestPage(reg, a->id); });

    CLI::App *job = app.add_subcommand("job", "print jobs");
    CLI::App *wait = job->add_subcommand(
        "wait",
        "wait until JOB has left the printer's queue.\n"
        "JOB is looked for as plain text in every line of lpq's listing, header lines included: use the handle\n"
        "'print' printed (xavo-...). A job number also matches header lines and other columns (\"1\" is found in\n"
        "\"usbprinter1 is ready\"), so such a wait may never end.");
    AddArg(wait, Arg::kPrinterId, a->id);
    wait->add_option("JOB", a->file, "the job's handle (its title), as 'print' printed it")->required()->check(Text(kMaxField));
    wait->add_option("--timeout", a->timeout, "seconds to wait, 1 to 86400 (default 60)")->check(CLI::Range(1u, 86400u));
    reg.On(wait, "xavoprinter job wait 04b8:0005:SN0001 xavo-3f9a0c12 --timeout 30", [&reg, a] { return JobWait(reg, *a); });

    CLI::App *spool = app.add_subcommand("spool", "the print spool");
    CLI::App *clean = spool->add_subcommand("clean", "cancel every job and empty the spool directory; checks with lpq");
    reg.On(clean, "xavoprinter spool clean", [&reg] { return SpoolClean(reg); });
}

}  // namespace cli
