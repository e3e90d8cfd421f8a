# vim: set fileencoding=unknown-thing :
x = 1
