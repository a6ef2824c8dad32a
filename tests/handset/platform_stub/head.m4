# SPDX-License-Identifier: Apache-2.0
# As much of a platform's policy as that of kestmodem is written against: classes, the macros and
# the types that it uses. It shows that the policy is sound in itself, not that it fits a platform.
define(`userdebug_or_eng', ifelse(target_build_variant, `user', , `$1'))
define(`domain_auto_trans', `
allow $1 $2:file { getattr open read execute map };
allow $1 $3:process transition;
allow $3 $2:file { entrypoint open read execute getattr map };
type_transition $1 $2:process $3;')
define(`init_daemon_domain', `domain_auto_trans(init, $1_exec, $1)')
define(`get_prop', `allow $1 $2:file { getattr open read map };')
define(`set_prop', `get_prop($1, $2)
allow $1 $2:property_service set;')
class file class dir class lnk_file class chr_file class blk_file
class process class capability class capability2 class unix_stream_socket class property_service
sid kernel
common file { open read write getattr setattr lock append map ioctl create rename unlink execute }
common socket { create bind listen accept connect read write }
class file inherits file { execute_no_trans entrypoint }
class dir inherits file { search add_name remove_name rmdir reparent }
class lnk_file inherits file
class chr_file inherits file
class blk_file inherits file
class process { transition }
class capability { chown dac_override dac_read_search fowner kill setgid setuid sys_admin }
class capability2 { block_suspend wake_alarm }
class unix_stream_socket inherits socket { connectto }
class property_service { set }
sensitivity s0;
dominance { s0 }
category c0;
level s0:c0;
mlsconstrain file { read } ( l1 dom l2 );
attribute domain; attribute coredomain;
attribute file_type; attribute exec_type; attribute system_file_type;
attribute data_file_type; attribute core_data_file_type;
attribute dev_type; attribute fs_type; attribute proc_type; attribute debugfs_type;
attribute sdcard_type; attribute property_type;
type kernel, domain; type init, domain; type shell, domain;
type system_app, domain; type system_server, domain;
type unlabeled, file_type;
type device, dev_type; type block_device, dev_type;
type rootfs, fs_type; type proc, fs_type, proc_type; type debugfs, fs_type, debugfs_type;
type fuse, sdcard_type, fs_type; type vfat, sdcard_type, fs_type;
type system_file, system_file_type, file_type;
type shell_exec, exec_type, system_file_type, file_type;
type toolbox_exec, exec_type, system_file_type, file_type;
type system_data_file, file_type, data_file_type, core_data_file_type;
type shell_data_file, file_type, data_file_type, core_data_file_type;
type storage_file, file_type;
type default_prop, property_type; type radio_prop, property_type;
type system_prop, property_type; type init_service_status_prop, property_type;
