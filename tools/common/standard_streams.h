// SPDX-License-Identifier: Apache-2.0
#ifndef COMMON_STANDARD_STREAMS_H_
#define COMMON_STANDARD_STREAMS_H_

// To be called before anything is opened. Takes the places of standard input, output and error
// that the program was started without: a file or a socket that got one of them would get what
// is printed. Using such a stream still fails.
void hold_standard_streams();

#endif  // COMMON_STANDARD_STREAMS_H_
