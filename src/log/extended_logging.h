#pragma once

namespace quorvel {

/// Settles `extended_logging`: on for an internal release type, and where the preference "ExtLogging" holds an integer,
/// whatever its value; off otherwise. Start-up, once, before any other thread runs.
void setup_extended_logging() noexcept;

}  // namespace quorvel
