// Conventions of the appliance's platform operations.
//
// The headers of this folder declare what the appliance supplies. Nothing here is code: the appliance's own libraries,
// or a stand-in for them, define every symbol of symbols.txt. The comments of the declarations refer to these rules.
//
//  1. Linkage. Plain functions (VLIB*, VORN*, WINI*, ErrWINI*, Bl*) have C linkage and never let an exception out.
//     Everything in a namespace or class has C++ linkage and may throw what its standard or JSON library throws.
//  2. Text. A `const char*` is NUL-terminated and not kept after the call, unless the declaration says so. A null
//     pointer is allowed only where the declaration says so. Bytes are passed as they are; nothing is recoded.
//  3. Buffers. A (buffer, size) pair is filled with a NUL-terminated text, cut to size - 1 bytes. On failure the
//     content of the buffer is not specified, so a caller zeroes it first and looks only at the result.
//  4. Results. Unless the declaration says otherwise, a signed result is 0 or more on success and negative on failure,
//     and a yes-or-no result is non-zero for yes and 0 for no.
//  5. Last error. A call that fails sets the calling thread's last error (code, source file, line); see core.h. A call
//     that succeeds leaves it alone.
//  6. Ownership. Who allocates a list, hash or record frees it, with the matching Free, exactly once. Free accepts
//     null. A text that a Get returns belongs to the object asked and is valid until that object is changed or freed.
//  7. Growth. An operation that takes the address of a list or hash pointer may replace the object; the caller goes on
//     with the new pointer and must not use the old one. The pointer is never null afterwards, also on failure.
//  8. Threads. Every operation may be called from several threads at once; one object is used by one thread at a time.
//  9. Failure lists. Each declaration ends in a line "Failure: ...". It lists every result by which failure shows, or
//     "none" where the operation has no failure that a caller could see. "throws" stands for an exception.
// 10. JSON. Json::Value crosses the boundary, so module and appliance use one and the same jsoncpp library.

#ifndef VORN_PLATFORM_CONVENTIONS_H
#define VORN_PLATFORM_CONVENTIONS_H

#endif
