# a byte order mark, and tabs
if a:
	b = 1
        c = 2
	d = "é€😀"; été = d
def f():
    return été
	   x = 1
if 1:
  x
 	y
  z
