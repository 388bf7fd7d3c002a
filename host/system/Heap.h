// SPDX-License-Identifier: Apache-2.0
// How the process's heap gives memory back.
//
// Which problem: the allocator learns from what is freed. After the first large block it keeps such blocks on the heap,
// where small ones that live long come to lie above them: half-sent frames, listings and replies that nobody read were
// gone, and their memory stayed with the process. How: large blocks that the heap has no room for as it is are mappings
// of their own, however many there were before. They go back to the system when they are freed, they grow without being
// copied, and of what was asked for only the pages are there that were written to.
//
// Threads: shapeHeap() before there are others.
#pragma once

namespace tarn::linux_host {

// Once, at the start of the process. An allocator that can't be told so goes on as it does.
void shapeHeap() noexcept;

}  // namespace tarn::linux_host
