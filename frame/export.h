#pragma once

// KFS_API marks what libkfs exports: functions, static data, and whole classes that a host derives from or catches.
// The library is built with hidden visibility, so a declaration without the mark doesn't leave it. An exported class
// exports its typeinfo and vtable with it, which dynamic_cast and catch in the host rely on.
//
// The mark is the same while building the library and while using it.
#define KFS_API __attribute__((visibility("default")))
