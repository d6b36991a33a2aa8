// Internal: what a Tesseract recogniser has done so far. Not part of the library's
// interface; the benchmarks and the engine's own tests read it to tell the engine's time
// from the rest of the pipeline's.
#pragma once

#include <cstddef>
#include <cstdint>

#include "Corvelbase/Export.h"

namespace corvel {

class TesseractRecognizer;

namespace detail {

struct TesseractStatistics {
  std::uint64_t recognitions = 0;    // engine passes over an image (detection included)
  double recognitionSeconds = 0;     // wall time inside the engine, summed over threads
  double recognitionCpuSeconds = 0;  // CPU time of the threads inside the engine
  std::uint64_t enginesStarted = 0;  // engines initialised (a pool miss each)
  double engineStartSeconds = 0;
  double engineStartCpuSeconds = 0;
  std::size_t idleEngines = 0;
};

// The counts of `recognizer` since it was made; safe while it recognises on other threads.
CORVEL_EXPORT TesseractStatistics tesseractStatistics(const TesseractRecognizer& recognizer);

}  // namespace detail
}  // namespace corvel
