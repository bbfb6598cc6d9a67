import { Alert, AlertActionLink } from '@patternfly/react-core/dist/esm/components/Alert';
import { ExpandableSection } from '@patternfly/react-core/dist/esm/components/ExpandableSection';
import type { ReactNode } from 'react';
import { ApiError } from '../api/error';
import { explain } from '../errors';
import { t } from '../texts';

interface ErrorAlertProps {
  error: unknown;
  // What failed, such as "The join failed."; the meaning of the error follows.
  title?: string;
  // Offers to try again.
  onRetry?: () => void;
  // More for "Details", such as the steps of a join.
  details?: ReactNode;
}

// An error in plain words: what it means, the likely cause, what to try, and its code. Read out when it appears.
export function ErrorAlert({ error, title, onRetry, details }: ErrorAlertProps) {
  const { code, meaning, cause, action } = explain(error);
  const said = error instanceof ApiError && error.kind === 'answer' ? error.details : null;
  return (
    <div role="alert" className="vorn-error">
      <Alert
        isInline
        variant="danger"
        component="p"
        title={title === undefined ? meaning : `${title} ${meaning}`}
        actionLinks={onRetry && <AlertActionLink onClick={onRetry}>{t('common.retry')}</AlertActionLink>}
      >
        <dl className="vorn-reasons">
          <dt>{t('error.cause')}</dt>
          <dd>{cause}</dd>
          <dt>{t('error.action')}</dt>
          <dd>{action}</dd>
        </dl>
        {code !== null && <p className="vorn-code">{t('error.code', { code: String(code) })}</p>}
        {(said !== null || details) && (
          <ExpandableSection toggleText={t('common.details')} className="vorn-details">
            {said !== null && (
              <p>
                {t('error.said')}: <code>{said}</code>
              </p>
            )}
            {details}
          </ExpandableSection>
        )}
      </Alert>
    </div>
  );
}
