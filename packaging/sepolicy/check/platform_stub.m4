divert(-1)
# STUB: the platform's macros under their own names, so that the policy can be compiled without a
# device's tree. What they expand to is like Android 8.1's as far as this policy needs it; a device's
# build uses the platform's own.

define(`r_file_perms', `{ getattr open read ioctl lock }')
define(`w_file_perms', `{ open append write lock }')
define(`x_file_perms', `{ getattr execute execute_no_trans }')
define(`rx_file_perms', `{ r_file_perms x_file_perms }')
define(`rw_file_perms', `{ r_file_perms w_file_perms }')
define(`create_file_perms', `{ create rename setattr unlink rw_file_perms }')
define(`r_dir_perms', `{ open getattr read search ioctl lock }')
define(`rw_dir_perms', `{ r_dir_perms add_name remove_name write lock }')
define(`create_dir_perms', `{ create reparent rename rmdir setattr rw_dir_perms }')
define(`create_socket_perms_no_ioctl',
  `{ create read getattr write setattr lock append bind connect getopt setopt shutdown }')
define(`create_socket_perms', `{ create_socket_perms_no_ioctl ioctl }')

define(`unpriv_sock_ioctls', `{ 0x8910 0x8912-0x8913 0x8915 0x8919 0x891b 0x8933 }')
define(`priv_sock_ioctls', `{ 0x8914 0x8927 0x8be0-0x8bff }')

define(`domain_auto_trans', `
allow $1 $2:file { getattr open read execute };
allow $1 $3:process transition;
allow $3 $2:file { getattr open read execute entrypoint };
type_transition $1 $2:process $3;
')
define(`init_daemon_domain', `domain_auto_trans(init, $1_exec, $1)')
define(`r_dir_file', `
allow $1 $2:dir r_dir_perms;
allow $1 $2:{ file lnk_file } r_file_perms;
')
define(`unix_socket_connect', `
allow $1 $2_socket:sock_file write;
allow $1 $3:unix_stream_socket connectto;
')
define(`get_prop', `allow $1 $2:file r_file_perms;')
define(`set_prop', `
unix_socket_connect($1, property, init)
allow $1 $2:property_service set;
get_prop($1, $2)
')
define(`read_logd', `
allow $1 logcat_exec:file rx_file_perms;
unix_socket_connect($1, logdr, logd)
')
define(`control_logd', `unix_socket_connect($1, logd, logd)')
define(`binder_use', `
allow $1 servicemanager:binder { call transfer };
allow servicemanager $1:dir search;
allow servicemanager $1:file { open read };
allow servicemanager $1:process getattr;
')
define(`binder_call', `
allow $1 $2:binder { call transfer };
allow $2 $1:binder transfer;
allow $1 $2:fd use;
')
define(`not_full_treble', ifelse(target_full_treble, `true', `', ``$1''))
define(`full_treble_only', ifelse(target_full_treble, `true', ``$1'', `'))
divert(0)dnl
