// The help of a program and its commands, and the same words for its man page.
#pragma once

#include <CLI/CLI.hpp>
#include <string>

namespace quorvel::tools {

/// What is asked with --help, at most 80 columns wide.
class HelpFormatter : public CLI::FormatterBase {
 public:
  [[nodiscard]] std::string make_help(const CLI::App* app, std::string name, CLI::AppFormatMode mode) const override;
};

/// "[--domain DOMAIN] KEY": what stands behind a command's name.
[[nodiscard]] std::string usage_of(const CLI::App& command);

/// A program's options and its commands with their words and options as the lists of an mdoc page.
[[nodiscard]] std::string man_text(const CLI::App& program);

}  // namespace quorvel::tools
