def read(): return u""
