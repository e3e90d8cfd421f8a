import pytest

from shop import Good
from shop.customers import Customer


@pytest.fixture
def good():
    return Good("thing", 4)


@pytest.fixture(name="buyer", scope="module")
def make_buyer(good):
    customer = Customer("Bert")
    yield customer
    customer.orders.clear()
