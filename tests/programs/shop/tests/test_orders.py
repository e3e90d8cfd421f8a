from shop import Order, total_of
from shop.goods import TAX


class TestOrder:
    def setup_method(self):
        self.tax = TAX

    def test_total(self, good, buyer):
        order = Order(buyer, [good])
        assert total_of(order, self.tax) == good.price
        assert order.customer.greet(buyer)

    def test_find(self, buyer: "Customer", unknown=None):
        found = buyer.order().find("x")
        if found is None:
            return
        found.take(count=2)
