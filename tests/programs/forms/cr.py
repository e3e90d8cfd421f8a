a = 1if a:    b = 2 # type: intd = "x\y"

class C:  def m(self): # type: () -> int    passe = """
"""