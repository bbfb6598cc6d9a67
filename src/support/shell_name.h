// Whether a name may stand in a shell command.

#ifndef VORN_SRC_SUPPORT_SHELL_NAME_H
#define VORN_SRC_SUPPORT_SHELL_NAME_H

// False when `name` can't be a DNS name because a byte of it means something to the shell, or because the command would
// take it for an option: a leading '-', any of 0x01 to 0x20 and 0x7F, or one of " ' ; & | < > ( ) $ \ * ? [ ] { } ~ # !
// and the backquote. Bytes of 0x80 and above are harmless and pass.
bool IsHarmlessToShell(const char* name);

#endif
