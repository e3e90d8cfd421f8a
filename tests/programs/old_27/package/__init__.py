missing_too = 1
