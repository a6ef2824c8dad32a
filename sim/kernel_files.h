// SPDX-License-Identifier: Apache-2.0
// The kernel's files that the service copies when a CP crashes: the CPs' memory and mini
// dumps and the debug records of the inter-processor communication driver. Contents are
// made from the file's name alone, so a copy can be checked without the original.
#ifndef SIM_KERNEL_FILES_H_
#define SIM_KERNEL_FILES_H_

#include <stddef.h>
#include <stdint.h>

#include <string>
#include <vector>

// In bytes; a size of 0 leaves the files of that kind out.
struct KernelFileSizes {
    size_t memory = 256 << 10;
    size_t mini_dump = 64 << 10;
    size_t ipc_record = 8 << 10;
};

// Makes proc/cpw, proc/cpt and proc/cptl with "mem" and "mini_dump", and d/dipx with "smsg",
// "sbuf" and "sblock", below the root. False with errno set on failure.
bool make_kernel_files(const std::string& root, const KernelFileSizes& sizes = KernelFileSizes());
// What the file of this name ("proc/cpw/mem") holds when it is so long. The IPC driver's
// records are text.
std::vector<uint8_t> kernel_file_content(const std::string& name, size_t size);

#endif  // SIM_KERNEL_FILES_H_
