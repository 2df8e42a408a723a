def measure(r): return {}
