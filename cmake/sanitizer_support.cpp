// The one atomic operation that the sanitizers' libraries call and a 32-bit PowerPC has no instruction for.

extern "C" unsigned long long ForSanitizers(unsigned long long* place, unsigned long long expected,
                                            unsigned long long wanted) asm("__sync_val_compare_and_swap_8");

unsigned long long ForSanitizers(unsigned long long* place, unsigned long long expected, unsigned long long wanted) {
    __atomic_compare_exchange_n(place, &expected, wanted, false, __ATOMIC_SEQ_CST, __ATOMIC_SEQ_CST);
    return expected;
}
