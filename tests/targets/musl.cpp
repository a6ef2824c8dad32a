// SPDX-License-Identifier: Apache-2.0
// The functions of the GNU C library that libstdc++.a and libgcc_eh.a call and musl does not
// have. Linked with the service; its own calls all have to be found in musl.
#include <stdint.h>
#include <unistd.h>

extern "C" {

extern const char __libc_single_threaded = 0;

uint32_t arc4random() {
    uint32_t number = 0;
    getentropy(&number, sizeof(number));
    return number;
}

// Where an exception would be looked for first. There are none.
int _dl_find_object(void* /*address*/, void* /*result*/) {
    return -1;
}

}  // extern "C"
