// The switch between the mutants that are compiled into one program. Included ahead of every file of the generated copy.

#ifndef VORN_TESTS_MUTATION_RUNTIME_H
#define VORN_TESTS_MUTATION_RUNTIME_H

namespace mutant {

constexpr int kMost = 1 << 15;

// The number in the environment variable MUTANT; -1 until it has been read, as it is during static initialisation.
extern int active;
// One flag for each mutant, when MUTANT_RECORD names a file; see listener.cpp. Otherwise null.
extern unsigned char* reached;

void Load();
void Mark(int first, int last);

// Whether this mutant is on.
inline bool On(int number) {
    if (active < 0) {
        Load();
    }
    if (reached != nullptr) {
        Mark(number, number);
    }
    return active == number;
}

// Named where the value is read that an initialiser with these mutants has set.
inline void Seen(int first, int last) {
    if (reached != nullptr) {
        Mark(first, last);
    }
}

}  // namespace mutant

#endif
