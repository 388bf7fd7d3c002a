// SPDX-License-Identifier: Apache-2.0
// Part of every mutated source, before its first line: which mutant is the chosen one.
//
// The build puts it before the source by an option of the compiler, so no source includes it. Neither variable is
// looked after by anybody but selector.cpp, which reads the choice from the environment before the program's own
// initialisation.
#pragma once

extern "C" {
extern int tarn_mutant_chosen;              // 0: none
extern unsigned char* tarn_mutant_reached;  // which were asked about, here or in a child process
}

// Whether the mutant of this number is the chosen one. Notes that the code came by, so that only the tests that come by
// a mutant are run for it. The numbers are below 65536, and nothing checks that.
inline bool tarn_mutant_is(int id) {
  tarn_mutant_reached[id] = 1;
  return id == tarn_mutant_chosen;
}
