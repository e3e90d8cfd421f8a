found = u"x".encode("utf-8")
import sub
