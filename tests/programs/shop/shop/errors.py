"""What can go wrong."""

__all__ = ["ShopError", "OutOfStock"]


class ShopError(Exception):
    """Any of them."""

    def __init__(self, message, *details, code=1):
        super().__init__(message)
        self.message, self.details = message, details
        self.code = code


class OutOfStock(ShopError):
    """Nothing is left of a good."""

    code: int = 7

    def __str__(self):
        return "%s (%d)" % (self.message, self.code)


class _Hidden(OutOfStock, KeyError):
    pass
