// SPDX-License-Identifier: Apache-2.0
// The one thing that the stand-in for the handset's libraries and the service itself both
// know of the host: a handset may live below a directory other than "/". Outside include/,
// which is not searched on a handset: this header is needed there, too.
#ifndef PLATFORM_ENV_ROOT_H_
#define PLATFORM_ENV_ROOT_H_

// Environment variable that names the directory standing for "/". Unset or empty
// (as on a handset): the real "/".
#define ENV_ROOT "KESTMODEM_ROOT"

#endif  // PLATFORM_ENV_ROOT_H_
