def text(f,p): return ''
