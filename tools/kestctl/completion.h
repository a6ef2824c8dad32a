// Completion of command lines, for the shells' scripts.
#ifndef KESTCTL_COMPLETION_H_
#define KESTCTL_COMPLETION_H_

#include <string>
#include <vector>

// As the first argument of kestctl it asks for the completions of the words that follow.
// For scripts only, hence not among the options that --help shows.
constexpr char COMPLETE_OPTION[] = "--complete";

// Prints what the last word may become, one a line. words are those after the program's
// name; the last one is what is being typed, often empty.
void print_completions(std::vector<std::string> words);

#endif  // KESTCTL_COMPLETION_H_
