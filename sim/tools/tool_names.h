// Names of the product's external programs that the multi-call program plays.
#pragma once

#include <string>

namespace kxlsim {

// The programs, without ".exe", in the order they are installed.
inline constexpr const char *kToolPrograms[] = {"kxlckupgrade", "kxlimaudcfg", "kxlimsslcfg", "kxlset",
                                                "kxlsyscs"};

// Base name of a started path ("/" or "\" separated), lower case, without a
// trailing ".exe".
std::string toolProgramName(const std::string &startedAs);

bool isToolProgram(const std::string &name);

// "kxlckupgrade, kxlimaudcfg, ..." for messages.
std::string toolProgramList();

// The arguments after the program name, separated by one blank, as given.
std::string joinArguments(int argc, char **argv);

} // namespace kxlsim
