import installed, typed
from installed import Public, VALUE, make as maker
from installed._impl import *
class Mine(Public):
    def run(self, times=2): return super().run(times)
    def extra(self): return self.run()
Mine().run()[0].run(); VALUE; maker().run(times=3); Impl().run(); typed.hint(1).upper(); installed.Public
