import catalogue from '@catalogue/error-codes.json';
import { render, screen } from '@testing-library/react';
import userEvent from '@testing-library/user-event';
import { describe, expect, it, vi } from 'vitest';
import { explain, explainCode } from '.';
import { ApiError, codes } from '../api/error';
import { ErrorAlert } from '../ui';

describe('explanations', () => {
  it.each(catalogue.codes)('of $code are those of the catalogue', ({ code, meaning, cause, action }) => {
    expect(explainCode(code)).toEqual({ code, meaning, cause, action });
  });

  it('are there for each code that the page acts on', () => {
    for (const code of Object.values(codes)) {
      expect(catalogue.codes.map((entry) => entry.code)).toContain(code);
    }
  });

  it('of a code of another release say so', () => {
    expect(explainCode(9999)).toMatchObject({
      code: 9999,
      meaning: expect.stringContaining('does not know'),
    });
  });

  it('of failures without a code differ by their kind', () => {
    const kinds = ['network', 'timeout', 'damaged'] as const;
    const meanings = kinds.map((kind) => explain(new ApiError(kind)).meaning);
    expect(new Set([...meanings, explain(new Error('x')).meaning]).size).toBe(4);
    expect(explain(new ApiError('network')).code).toBeNull();
  });
});

describe('the alert', () => {
  it('tells the cause, what to try, the code, and on demand what the appliance said', async () => {
    const retry = vi.fn();
    const error = new ApiError('answer', { code: 2607, details: 'kinit: no' });
    render(<ErrorAlert error={error} title="The join failed." onRetry={retry} details={<p>the steps</p>} />);
    const alert = screen.getByRole('alert');
    expect(alert).toHaveTextContent('The join failed. The account or its password is wrong.');
    expect(alert).toHaveTextContent(explainCode(2607).cause);
    expect(alert).toHaveTextContent(explainCode(2607).action);
    expect(alert).toHaveTextContent('Code 2607');
    expect(screen.getByText('the steps')).not.toBeVisible();
    await userEvent.click(screen.getByRole('button', { name: 'Details' }));
    expect(screen.getByText('the steps')).toBeVisible();
    expect(screen.getByText('kinit: no')).toBeVisible();
    await userEvent.click(screen.getByRole('button', { name: 'Try again' }));
    expect(retry).toHaveBeenCalledOnce();
  });
});
