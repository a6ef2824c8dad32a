# SPDX-License-Identifier: Apache-2.0
role r; role r types domain;
user u roles { r } level s0 range s0 - s0:c0;
sid kernel u:r:kernel:s0
genfscon rootfs / u:object_r:rootfs:s0
genfscon proc / u:object_r:proc:s0
genfscon debugfs / u:object_r:debugfs:s0
