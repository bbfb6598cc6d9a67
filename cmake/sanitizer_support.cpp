// What the sanitizers' libraries need on a 32-bit PowerPC.

// The one atomic operation that they call and the machine has no instruction for.
extern "C" unsigned long long ForSanitizers(unsigned long long* place, unsigned long long expected,
                                            unsigned long long wanted) asm("__sync_val_compare_and_swap_8");

unsigned long long ForSanitizers(unsigned long long* place, unsigned long long expected, unsigned long long wanted) {
    __atomic_compare_exchange_n(place, &expected, wanted, false, __ATOMIC_SEQ_CST, __ATOMIC_SEQ_CST);
    return expected;
}

// Freed memory is kept for a while to notice its use; as much as is usual would not fit between the shadow and the
// stack. The search for leaks needs a kernel's ways to look at a process, which an emulator does not have. Who allocated a
// block is told by two frames, since each frame takes its time there; ASAN_OPTIONS asks for more.
extern "C" const char* __asan_default_options() {
    return "quarantine_size_mb=8:detect_leaks=0:malloc_context_size=2";
}
