#pragma once

// What the headers of a platform with data-protection classes declare, to build the program as it is built there.
#define F_SETPROTECTIONCLASS 64
extern "C" int open_dprotected_np(const char* path, int flags, int protection_class, int dpflags, ...);
