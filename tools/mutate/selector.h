// Part of every mutated source, before its first line: which mutant is the chosen one.
#pragma once

extern "C" {
extern int tarn_mutant_chosen;              // 0: none
extern unsigned char* tarn_mutant_reached;  // which were asked about, here or in a child process
}

inline bool tarn_mutant_is(int id) {
  tarn_mutant_reached[id] = 1;
  return id == tarn_mutant_chosen;
}
