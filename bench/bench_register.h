// Each benchmark file registers its benchmarks at run time, so that smoke mode can
// choose smaller sizes.
#ifndef ANNO_BENCH_REGISTER_H
#define ANNO_BENCH_REGISTER_H

namespace annobench {

void RegisterWalkBenchmarks();
void RegisterStoreBenchmarks();

}  // namespace annobench

#endif  // ANNO_BENCH_REGISTER_H
