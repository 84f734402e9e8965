#include "report/commands.h"

#include <CLI/CLI.hpp>
#include <csignal>
#include <cstdio>
#include <memory>

namespace {

constexpr size_t kHelpColumn = 26, kHelpWidth = 80;

// Help that fits a terminal: an option shows its argument and nothing else, and its text is wrapped.
class HelpFormat : public CLI::Formatter {
public:
    HelpFormat() { column_width(kHelpColumn); }
    std::string make_option_opts(const CLI::Option *option) const override {
        std::string name = option->get_type_name();  // and, behind a colon, what checks say about themselves
        return option->get_type_size() == 0 ? "" : " " + name.substr(0, name.find(':'));
    }
    std::string make_option_desc(const CLI::Option *option) const override {
        std::string text = option->get_description();
        size_t lineStart = 0;
        while (text.size() - lineStart > kHelpWidth - kHelpColumn) {
            size_t blank = text.rfind(' ', lineStart + kHelpWidth - kHelpColumn);
            if (blank == std::string::npos || blank < lineStart) {
                break;
            }
            text[blank] = '\n';
            lineStart = blank + 1;
        }
        return text;
    }
};

int Run(int argc, char **argv) {
    signal(SIGPIPE, SIG_IGN);  // a reader that goes away shows at the write
    CLI::App program("Reads reports of lan-meter: records, tables, findings, and a page to look at", "lan-report");
    program.formatter(std::make_shared<HelpFormat>());
    program.require_subcommand(1);
    program.set_version_flag("--version", "lan-report " LAN_REPORT_VERSION, "Show the version");
    program.get_help_ptr()->description("Show this help");
    program.footer("lan-report COMMAND -h tells the options of a command.\n"
                   "Input is what lan-meter wrote, or what \"records\" made of it, plain or gzip;\n"
                   "several files are one series, - or no file is standard input.\n"
                   "Exit status: 0 done, 1 input or output failed, 2 command line.");
    report::Status status = report::kDone;
    report::RecordsCommand(program, &status);
    report::TableCommand(program, &status);
    report::SummaryCommand(program, &status);
    report::PageCommand(program, &status);
    try {
        program.parse(argc, argv);
    } catch (const CLI::ParseError &error) {
        return program.exit(error) == 0 ? report::kDone : report::kUsage;
    }
    return status;
}

}  // namespace

int main(int argc, char **argv) {
    try {
        return Run(argc, argv);
    } catch (...) {  // nothing but want of memory is left
        fputs("lan-report: no memory\n", stderr);
        return report::kFailed;
    }
}
