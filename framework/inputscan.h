// The scan of the input detectors that ask their camera about one input per request and
// stop at the first active input. Runs on the calling detector's worker thread.

#ifndef EVWATCH_FRAMEWORK_INPUTSCAN_H_
#define EVWATCH_FRAMEWORK_INPUTSCAN_H_

// Asks the inputs first, first + 1, ..., count of them, in order: ask(index) gives whether
// that input is active, and each answer is stored in `active`. Stops at the first active
// input, so later inputs are not asked. A count below 1 asks nothing and leaves `active`.
template <typename Ask>
void AskUntilActive(int first, int count, bool& active, Ask&& ask) {
  for (int i = 0; i < count; ++i) {
    active = ask(first + i);
    if (active) return;
  }
}

#endif  // EVWATCH_FRAMEWORK_INPUTSCAN_H_
