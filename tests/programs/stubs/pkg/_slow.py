def compute(n): return n * 2
